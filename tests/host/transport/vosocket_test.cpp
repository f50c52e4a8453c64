#include "framework/host/vosocket.h"

#include <errno.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <string>

#include <gtest/gtest.h>

#include "sim/net/tcpserver.h"
#include "tests/support/fakecamera.h"

namespace {

using std::chrono::milliseconds;

// Gives tests access to the descriptor, as a subclass that sets socket options would.
class ProbeSocket : public VoSocket {
 public:
  using VoSocket::VoSocket;
  int Fd() const { return Descriptor(); }
};

int RefusingPort(int* fd) {
  *fd = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  bind(*fd, reinterpret_cast<sockaddr*>(&address), sizeof(address));
  socklen_t length = sizeof(address);
  getsockname(*fd, reinterpret_cast<sockaddr*>(&address), &length);
  return ntohs(address.sin_port);
}

TEST(VoSocketTest, ConnectsWritesAndReads) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    std::string request;
    if (connection.ReadExactly(5, request) && request == "hello") connection.Write("world!");
  });
  ProbeSocket socket("127.0.0.1", server.Port(), 5, true);
  EXPECT_EQ(socket.Fd(), -1);
  ASSERT_EQ(socket.BuildConnect(), 0);
  EXPECT_GE(socket.Fd(), 0);
  char hello[] = "hello";
  EXPECT_EQ(socket.WriteData(hello, 5), 5);
  char buffer[6];
  ASSERT_EQ(socket.ReadData(buffer, 6), 6);
  EXPECT_EQ(std::string(buffer, 6), "world!");
  EXPECT_EQ(server.Received(), (std::vector<std::string>{"hello"}));
  socket.DisConnect();
  EXPECT_EQ(socket.Fd(), -1);
}

TEST(VoSocketTest, WholeReadWaitsForAllBytes) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    for (const char* piece : {"abc", "def", "gh"}) {
      connection.SleepFor(milliseconds(50));
      connection.Write(piece);
    }
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, true);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char buffer[8];
  ASSERT_EQ(socket.ReadData(buffer, 8), 8);
  EXPECT_EQ(std::string(buffer, 8), "abcdefgh");
}

TEST(VoSocketTest, PartialReadReturnsWhatArrived) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    connection.Write("abc");
    std::string ack;
    if (connection.ReadExactly(1, ack)) connection.Write("defg");
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char buffer[16];
  // The camera sends nothing more until it hears from us, so only "abc" can have come.
  ASSERT_EQ(socket.ReadData(buffer, 16), 3);
  EXPECT_EQ(std::string(buffer, 3), "abc");
  char ack[] = "k";
  ASSERT_EQ(socket.WriteData(ack, 1), 1);
  ASSERT_EQ(socket.ReadData(buffer, 2), 2);
  EXPECT_EQ(std::string(buffer, 2), "de");
  ASSERT_EQ(socket.ReadData(buffer, 16), 2);
  EXPECT_EQ(std::string(buffer, 2), "fg");
}

TEST(VoSocketTest, NothingInTimeIsEagain) {
  for (bool whole : {true, false}) {
    evtest::RawTcpServer server([](evtest::RawConnection& connection) {
      connection.SleepFor(std::chrono::seconds(30));
    });
    VoSocket socket("127.0.0.1", server.Port(), 1, whole);
    ASSERT_EQ(socket.BuildConnect(), 0);
    char buffer[12];
    errno = 0;
    EXPECT_EQ(socket.ReadData(buffer, 12), -1);
    EXPECT_EQ(errno, EAGAIN);
    errno = 0;
    EXPECT_EQ(socket.ReadToLineEnd(buffer, 12), -1);
    EXPECT_EQ(errno, EAGAIN);
  }
}

TEST(VoSocketTest, WholeReadTimesOutWithWhatCame) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    connection.Write("ab");
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket socket("127.0.0.1", server.Port(), 1, true);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char buffer[10];
  ASSERT_EQ(socket.ReadData(buffer, 10), 2);
  EXPECT_EQ(std::string(buffer, 2), "ab");
}

TEST(VoSocketTest, OrderlyCloseReadsZero) {
  for (bool whole : {true, false}) {
    evtest::RawTcpServer server([](evtest::RawConnection& connection) { connection.Write("xy"); });
    VoSocket socket("127.0.0.1", server.Port(), 5, whole);
    ASSERT_EQ(socket.BuildConnect(), 0);
    char buffer[10];
    std::string got;
    int n;
    while ((n = socket.ReadData(buffer, 10)) > 0) got.append(buffer, n);
    EXPECT_EQ(n, 0);
    EXPECT_EQ(got, "xy");
    EXPECT_EQ(socket.ReadData(buffer, 10), 0);
  }
}

TEST(VoSocketTest, ReadsLines) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    connection.Write("one\r\ntwo\n\nlonger line\nlast");
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char line[5];
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "one");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "two");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 0);
  EXPECT_STREQ(line, "");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "long");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "er l");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "ine");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "last");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), -1);
}

TEST(VoSocketTest, LineArrivingInPiecesIsReadWhole) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    for (const char* piece : {"sta", "tus=", "1\r", "\nnext\n"}) {
      connection.Write(piece);
      connection.SleepFor(milliseconds(30));
    }
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char line[64];
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 8);
  EXPECT_STREQ(line, "status=1");
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "next");
}

TEST(VoSocketTest, DataAfterLineComesFirst) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    connection.Write("head\nBODY");
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char line[64];
  ASSERT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 4);
  char data[4];
  ASSERT_EQ(socket.ReadData(data, 4), 4);
  EXPECT_EQ(std::string(data, 4), "BODY");
}

TEST(VoSocketTest, WritesLargeBlock) {
  const std::string block(2 * 1024 * 1024, 'w');
  evtest::RawTcpServer server([&block](evtest::RawConnection& connection) {
    std::string got;
    if (connection.ReadExactly(block.size(), got, std::chrono::seconds(30))) {
      connection.Write("done");
    }
  });
  VoSocket socket("127.0.0.1", server.Port(), 5, true);
  ASSERT_EQ(socket.BuildConnect(), 0);
  std::string copy = block;
  EXPECT_EQ(socket.WriteData(copy.data(), static_cast<int>(copy.size())),
            static_cast<int>(copy.size()));
  char reply[4];
  ASSERT_EQ(socket.ReadData(reply, 4), 4);
  EXPECT_EQ(std::string(reply, 4), "done");
  auto received = server.Received();
  ASSERT_EQ(received.size(), 1u);
  EXPECT_TRUE(received[0] == block);
}

TEST(VoSocketTest, WriteToClosedPeerFailsWithoutSignal) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) { connection.Close(); });
  VoSocket socket("127.0.0.1", server.Port(), 2, true);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char buffer[1];
  EXPECT_EQ(socket.ReadData(buffer, 1), 0);  // the camera has gone
  std::string block(1024 * 1024, 'x');
  int result = 0;
  for (int i = 0; i < 10 && result >= 0; ++i) {
    result = socket.WriteData(block.data(), static_cast<int>(block.size()));
  }
  EXPECT_EQ(result, -1);
}

TEST(VoSocketTest, ConnectionRefused) {
  int fd;
  int port = RefusingPort(&fd);
  VoSocket socket("127.0.0.1", port, 2, false);
  EXPECT_EQ(socket.BuildConnect(), -1);
  char buffer[4] = {'a', 'b', 'c', 'd'};
  errno = 0;
  EXPECT_EQ(socket.ReadData(buffer, 4), -1);
  EXPECT_NE(errno, EAGAIN);
  EXPECT_EQ(socket.ReadToLineEnd(buffer, 4), -1);
  EXPECT_EQ(socket.WriteData(buffer, 4), -1);
  socket.DisConnect();  // harmless
  close(fd);
}

TEST(VoSocketTest, BadArgumentsFail) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) {
    connection.SleepFor(std::chrono::seconds(30));
  });
  VoSocket bad_port("127.0.0.1", 0, 1, false);
  EXPECT_EQ(bad_port.BuildConnect(), -1);
  VoSocket unknown("no-such-host.invalid", 80, 1, false);
  EXPECT_EQ(unknown.BuildConnect(), -1);
  VoSocket socket("127.0.0.1", server.Port(), 1, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char buffer[4];
  EXPECT_EQ(socket.ReadData(nullptr, 4), -1);
  EXPECT_EQ(socket.ReadData(buffer, 0), 0);
  EXPECT_EQ(socket.ReadToLineEnd(buffer, 1), -1);
  EXPECT_EQ(socket.WriteData(nullptr, 4), -1);
}

TEST(VoSocketTest, ReconnectsAfterDisConnect) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) { connection.Write("hi\n"); });
  VoSocket socket("127.0.0.1", server.Port(), 5, false);
  for (int round = 0; round < 2; ++round) {
    ASSERT_EQ(socket.BuildConnect(), 0);
    char line[8];
    EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 2);
    EXPECT_STREQ(line, "hi");
    socket.DisConnect();
  }
  EXPECT_EQ(server.Connections(), 2);
}

TEST(VoSocketTest, ConnectsByName) {
  evtest::RawTcpServer server([](evtest::RawConnection& connection) { connection.Write("v4\n"); });
  VoSocket socket("localhost", server.Port(), 5, false);
  ASSERT_EQ(socket.BuildConnect(), 0);
  char line[8];
  EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 2);
  EXPECT_STREQ(line, "v4");
}

TEST(VoSocketTest, ConnectsToIpv6Literal) {
  evsim::TcpServer server([](evsim::TcpConnection& connection) { connection.Write("v6\n"); },
                          "::1");
  if (server.Port() <= 0) GTEST_SKIP() << "::1 is not available";
  for (const std::string host : {"::1", "[::1]"}) {
    VoSocket socket(host, server.Port(), 5, false);
    ASSERT_EQ(socket.BuildConnect(), 0) << host;
    char line[8];
    EXPECT_EQ(socket.ReadToLineEnd(line, sizeof(line)), 2) << host;
    EXPECT_STREQ(line, "v6");
  }
}

}  // namespace
