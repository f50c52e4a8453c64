#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <future>
#include <thread>

#include "tests/support/fakecamera.h"
#include "tests/support/loopbackclient.h"

namespace evtest {
namespace {

using std::chrono::milliseconds;

TEST(RawTcpServerTest, RunsTheScriptedExchange) {
  RawTcpServer server([](RawConnection& c) {
    std::string in;
    if (!c.ReadExactly(4, in) || in != std::string("\x01\x02\x03\x04", 4)) return;
    c.Write(std::string("\xaa\x00\xbb", 3));
    if (!c.ReadExactly(6, in)) return;
    c.Write("got " + in);
  });
  ASSERT_GT(server.Port(), 0);

  LoopbackClient client(server.Port());
  ASSERT_TRUE(client.Connected());
  // The first record comes in two segments; ReadExactly still reads it whole.
  ASSERT_TRUE(client.Send(std::string("\x01\x02", 2)));
  std::this_thread::sleep_for(milliseconds(20));
  ASSERT_TRUE(client.Send(std::string("\x03\x04", 2)));
  EXPECT_EQ(client.ReadUntil(std::string("\xbb", 1)), std::string("\xaa\x00\xbb", 3));
  ASSERT_TRUE(client.Send("second"));
  EXPECT_EQ(client.ReadAll(), "got second");

  EXPECT_EQ(server.Connections(), 1);
  EXPECT_EQ(server.Received(),
            (std::vector<std::string>{std::string("\x01\x02\x03\x04", 4), "second"}));
}

TEST(RawTcpServerTest, ReadExactlyTimesOutOnAShortRecord) {
  std::promise<bool> result;
  RawTcpServer server([&result](RawConnection& c) {
    std::string in;
    bool ok = c.ReadExactly(8, in, milliseconds(100));
    result.set_value(ok);
    c.Write("timed out");
  });
  LoopbackClient client(server.Port());
  ASSERT_TRUE(client.Send("abc"));
  EXPECT_EQ(client.ReadAll(), "timed out");
  EXPECT_FALSE(result.get_future().get());
  EXPECT_TRUE(server.Received().empty());
}

TEST(RawTcpServerTest, ReadExactlyFailsWhenThePeerCloses) {
  std::promise<bool> result;
  RawTcpServer server([&result](RawConnection& c) {
    std::string in;
    result.set_value(c.ReadExactly(8, in));
  });
  {
    LoopbackClient client(server.Port());
    ASSERT_TRUE(client.Send("abc"));
  }
  EXPECT_FALSE(result.get_future().get());
}

TEST(RawTcpServerTest, CloseEndsTheConnection) {
  RawTcpServer server([](RawConnection& c) {
    c.Write("bye");
    c.Close();
    EXPECT_FALSE(c.Write("after close"));
  });
  LoopbackClient client(server.Port());
  EXPECT_EQ(client.ReadAll(), "bye");
}

TEST(RawTcpServerTest, EachConnectionRunsTheScript) {
  RawTcpServer server([](RawConnection& c) {
    std::string in;
    if (c.ReadExactly(2, in)) c.Write(in + in);
  });
  LoopbackClient a(server.Port());
  LoopbackClient b(server.Port());
  LoopbackClient c(server.Port());
  ASSERT_TRUE(a.Send("aa"));
  ASSERT_TRUE(b.Send("bb"));
  ASSERT_TRUE(c.Send("cc"));
  EXPECT_EQ(c.ReadAll(), "cccc");
  EXPECT_EQ(a.ReadAll(), "aaaa");
  EXPECT_EQ(b.ReadAll(), "bbbb");
  EXPECT_EQ(server.Connections(), 3);
  std::vector<std::string> received = server.Received();
  std::sort(received.begin(), received.end());
  EXPECT_EQ(received, (std::vector<std::string>{"aa", "bb", "cc"}));
}

TEST(RawTcpServerTest, DestructionStopsScriptsThatWaitOrSleep) {
  std::atomic<int> finished{0};
  std::atomic<int> started{0};
  auto server = std::make_unique<RawTcpServer>([&](RawConnection& c) {
    ++started;
    std::string in;
    if (started == 1) {
      EXPECT_FALSE(c.ReadExactly(1, in, std::chrono::minutes(10)));
    } else {
      EXPECT_FALSE(c.SleepFor(std::chrono::minutes(10)));
    }
    ++finished;
  });
  LoopbackClient reader(server->Port());
  while (started < 1) std::this_thread::sleep_for(milliseconds(1));
  LoopbackClient sleeper(server->Port());
  while (started < 2) std::this_thread::sleep_for(milliseconds(1));

  server.reset();
  EXPECT_EQ(finished, 2);
  EXPECT_TRUE(reader.WaitClosed());
  EXPECT_TRUE(sleeper.WaitClosed());
}

}  // namespace
}  // namespace evtest
