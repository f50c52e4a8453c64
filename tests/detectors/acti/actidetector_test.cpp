#include "detectors/acti/actidetector.h"

#include <gtest/gtest.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <future>
#include <memory>
#include <mutex>
#include <ostream>
#include <string>
#include <thread>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::RawConnection;
using evtest::RawTcpServer;
using evtest::Report;
using evtest::Respond;
using evtest::Text;
using std::chrono::milliseconds;
using std::chrono::seconds;

const char kPortPath[] = "/cgi-bin/cmd/system?PORT_CONTROL";
const char kInputPath[] = "/cgi-bin/cmd/mpeg4?DIO_STATUS";
const uint32_t kMotion = 65593;

std::string Le32(uint32_t value) {
  std::string bytes(4, '\0');
  for (int i = 0; i < 4; ++i) bytes[i] = static_cast<char>((value >> (8 * i)) & 0xff);
  return bytes;
}

std::string Record(uint32_t type, int32_t length, const std::string& payload = "") {
  return "ACTi" + Le32(type) + Le32(static_cast<uint32_t>(length)) + payload;
}

const std::string kLiveRequest("ACTi\x30\0\0\0\0\0\0\0", 12);

// The login packet as the camera must receive it, built from the layout by hand.
std::string LoginPacket(const std::string& user, const std::string& password) {
  std::string packet(128, '\0');
  packet.replace(0, std::min<size_t>(user.size(), 31), user.substr(0, 31));
  packet[32] = '\x01';
  packet.replace(64, std::min<size_t>(password.size(), 63), password.substr(0, 63));
  return packet;
}

// Reads the 128-byte login and answers it; false when no login came.
bool AnswerLogin(RawConnection& c, const std::string& reply = std::string(1, '\0')) {
  std::string login;
  return c.ReadExactly(128, login) && c.Write(reply);
}

// Keeps the connection open, saying nothing, until the server stops.
void HoldOpen(RawConnection& c) {
  while (c.SleepFor(milliseconds(50))) {
  }
}

// Lets a camera script wait for the test (records sent before the detector has read the
// login reply would be read together with it).
class Gate {
 public:
  void Open() {
    std::lock_guard<std::mutex> lock(mutex_);
    open_ = true;
    cv_.notify_all();
  }
  bool Wait(milliseconds deadline = seconds(10)) {
    std::unique_lock<std::mutex> lock(mutex_);
    return cv_.wait_for(lock, deadline, [this] { return open_; });
  }

 private:
  std::mutex mutex_;
  std::condition_variable cv_;
  bool open_ = false;
};

// A fake clock for the live-request timing, in microseconds.
class FakeClock {
 public:
  explicit FakeClock(long long start) : micros_(start) {}
  void Set(long long micros) { micros_ = micros; }
  ACTiMD::TimeSource Source() {
    return [this] {
      long long now = micros_.load();
      timeval t{};
      t.tv_sec = static_cast<time_t>(now / 1000000);
      t.tv_usec = static_cast<suseconds_t>(now % 1000000);
      return t;
    };
  }

 private:
  std::atomic<long long> micros_;
};

// Exposes the descriptor, to read back the socket options that were set on it.
class ProbeSocket : public ACTiSocket {
 public:
  using ACTiSocket::ACTiSocket;
  int Fd() const { return Descriptor(); }
};

int IntOption(int fd, int level, int name) {
  int value = -1;
  socklen_t length = sizeof(value);
  if (getsockopt(fd, level, name, &value, &length) != 0) return -1000;
  return value;
}

// What a new TCP socket has before anyone sets it.
int DefaultTcpOption(int name) {
  int fd = socket(AF_INET, SOCK_STREAM, 0);
  int value = IntOption(fd, IPPROTO_TCP, name);
  close(fd);
  return value;
}

// Sends the syslog lines of its lifetime to stderr as well, and captures stderr.
class LogCapture {
 public:
  LogCapture() {
    openlog("actidetector_test", LOG_PERROR, LOG_USER);
    testing::internal::CaptureStderr();
  }
  ~LogCapture() {
    if (!taken_) testing::internal::GetCapturedStderr();
    closelog();
  }
  std::string Take() {
    taken_ = true;
    return testing::internal::GetCapturedStderr();
  }

 private:
  bool taken_ = false;
};

struct Reading {
  int result;
  bool detected;
  unsigned int level;
  bool operator==(const Reading& other) const {
    return result == other.result && detected == other.detected && level == other.level;
  }
};

void PrintTo(const Reading& r, std::ostream* os) {
  *os << "{" << r.result << ", " << (r.detected ? "true" : "false") << ", " << r.level << "}";
}

Reading Read(ACTiMD& detector) {
  Reading r{0, true, 77};
  r.result = detector.DoMD(r.detected, r.level);
  return r;
}

const Reading kMotionReading{0, true, 100};
const Reading kQuietReading{0, false, 0};
const Reading kLost{-1, false, 0};

int Count(const std::vector<std::string>& received, const std::string& bytes) {
  return static_cast<int>(std::count(received.begin(), received.end(), bytes));
}

class ACTiTest : public ::testing::Test {
 protected:
  static evtest::Reply PortAnswer(const std::string& value) {
    return Text("PORT_CONTROL='" + value + "'\n\n");
  }
  void PointAt(const RawTcpServer& control) {
    cam_.Answer(kPortPath, PortAnswer(std::to_string(control.Port())));
  }
  Camera MakeCamera(const std::string& user, const std::string& password) {
    return Camera(cam_.Record(user, password));
  }
  // Logs in with user and password; the login packet the camera received, or "" when the
  // login failed.
  std::string LoginAs(const std::string& user, const std::string& password) {
    RawTcpServer control([](RawConnection& c) {
      AnswerLogin(c);
      HoldOpen(c);
    });
    Camera camera = MakeCamera(user, password);
    ACTiSocket socket("127.0.0.1", control.Port(), 1, false);
    if (ControlConnectAuth(&camera, &socket) != 0) return "";
    std::vector<std::string> received = control.Received();
    return received.size() == 1 ? received[0] : "";
  }
  // Login over a camera that answers `reply`: ControlConnectAuth's result.
  int LoginWithReply(const std::string& reply) {
    RawTcpServer control([&reply](RawConnection& c) {
      AnswerLogin(c, reply);
      HoldOpen(c);
    });
    ACTiSocket socket("127.0.0.1", control.Port(), 1, false);
    return ControlConnectAuth(&camera_, &socket);
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "123456")};
};

TEST_F(ACTiTest, ChangeEndianIntReversesTheFourBytes) {
  EXPECT_EQ(ChangeEndianInt(1), 0x01000000);
  EXPECT_EQ(static_cast<uint32_t>(ChangeEndianInt(65593)), 0x39000100u);
  EXPECT_EQ(static_cast<uint32_t>(ChangeEndianInt(0x12345678)), 0x78563412u);
  EXPECT_EQ(static_cast<uint32_t>(ChangeEndianInt(0xff000000u)), 0x000000ffu);
  EXPECT_EQ(static_cast<uint32_t>(ChangeEndianInt(ChangeEndianInt(0xdeadbeefu))), 0xdeadbeefu);
}

TEST_F(ACTiTest, ControlPortIsReadFromTheSystemCgi) {
  cam_.Answer(kPortPath, PortAnswer("6002"));
  int port = -1;
  EXPECT_EQ(GetControlPort(&camera_, port), 0);
  EXPECT_EQ(port, 6002);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPortPath}));
  EXPECT_EQ(cam_.Requests()[0].method, "GET");
}

TEST_F(ACTiTest, PortAbcGivesPortZeroAndSuccess) {
  cam_.Answer(kPortPath, PortAnswer("abc"));
  int port = -1;
  EXPECT_EQ(GetControlPort(&camera_, port), 0);
  EXPECT_EQ(port, 0);
}

TEST_F(ACTiTest, ControlPortWithoutTheKeyReadsAsZero) {
  cam_.Answer(kPortPath, Text("PORT_HTTP='80'\n\n"));
  int port = -1;
  EXPECT_EQ(GetControlPort(&camera_, port), 0);
  EXPECT_EQ(port, 0);
}

TEST_F(ACTiTest, FailedPortQueryLeavesThePort) {
  cam_.Answer(kPortPath, Respond(404, "text/plain", "no\n"));
  int port = 1234;
  EXPECT_EQ(GetControlPort(&camera_, port), -1);
  EXPECT_EQ(port, 1234);
  // The body must end with an empty line (or reach ten lines) to count as read.
  cam_.Answer(kPortPath, Text("PORT_CONTROL='6002'\n"));
  EXPECT_EQ(GetControlPort(&camera_, port), -1);
  EXPECT_EQ(port, 1234);
  EXPECT_EQ(GetControlPort(nullptr, port), -1);
}

TEST_F(ACTiTest, LoginPacketCarriesUserFlagAndPassword) {
  EXPECT_EQ(LoginAs("admin", "123456"), LoginPacket("admin", "123456"));
  std::string packet = LoginAs("Admin", "p4ss");
  ASSERT_EQ(packet.size(), 128u);
  EXPECT_EQ(packet.substr(0, 6), std::string("Admin\0", 6));
  EXPECT_EQ(packet.substr(32, 4), std::string("\x01\0\0\0", 4));
  EXPECT_EQ(packet.substr(36, 28), std::string(28, '\0'));
  EXPECT_EQ(packet.substr(64, 5), std::string("p4ss\0", 5));
}

TEST_F(ACTiTest, LongUserNameAndPasswordAreCutTo31And63) {
  const std::string user(40, 'u');
  const std::string password(80, 'p');
  std::string packet = LoginAs(user, password);
  EXPECT_EQ(packet, LoginPacket(user, password));
  ASSERT_EQ(packet.size(), 128u);
  EXPECT_EQ(packet.substr(0, 31), std::string(31, 'u'));
  EXPECT_EQ(packet[31], '\0');
  EXPECT_EQ(packet.substr(64, 63), std::string(63, 'p'));
  EXPECT_EQ(packet[127], '\0');
  // Exactly 32 and 64 characters are cut as well; 31 and 63 fit.
  EXPECT_EQ(LoginAs(std::string(32, 'a'), std::string(64, 'b')),
            LoginPacket(std::string(31, 'a'), std::string(63, 'b')));
  EXPECT_EQ(LoginAs(std::string(31, 'a'), std::string(63, 'b')),
            LoginPacket(std::string(31, 'a'), std::string(63, 'b')));
}

TEST_F(ACTiTest, EmptyUserAndPasswordSendOnlyTheFlag) {
  std::string expected(128, '\0');
  expected[32] = '\x01';
  EXPECT_EQ(LoginAs("", ""), expected);
}

TEST_F(ACTiTest, SingleZeroByteReplyIsAnAcceptedLogin) {
  EXPECT_EQ(LoginWithReply(std::string(1, '\0')), 0);
  EXPECT_EQ(LoginWithReply(std::string(128, '\0')), 0);
  EXPECT_EQ(LoginWithReply(std::string("\0\x01\x02", 3)), 0);
}

TEST_F(ACTiTest, ReplyStartingWithOneIsARefusal) {
  std::string reply(128, '\0');
  reply[0] = '\x01';
  EXPECT_EQ(LoginWithReply(reply), -1);
  EXPECT_EQ(LoginWithReply("\x01"), -1);
}

TEST_F(ACTiTest, NoReplyIsAFailedLogin) {
  RawTcpServer closes([](RawConnection& c) {
    std::string login;
    c.ReadExactly(128, login);
  });
  ACTiSocket socket("127.0.0.1", closes.Port(), 1, false);
  EXPECT_EQ(ControlConnectAuth(&camera_, &socket), -1);
  EXPECT_EQ(closes.Received().size(), 1u);

  RawTcpServer silent([](RawConnection& c) {
    std::string login;
    c.ReadExactly(128, login);
    HoldOpen(c);
  });
  ACTiSocket waiting("127.0.0.1", silent.Port(), 1, false);
  EXPECT_EQ(ControlConnectAuth(&camera_, &waiting), -1);
}

TEST_F(ACTiTest, NullArgumentsFailTheLogin) {
  ACTiSocket socket("127.0.0.1", 1, 1, false);
  EXPECT_EQ(ControlConnectAuth(nullptr, &socket), -1);
  EXPECT_EQ(ControlConnectAuth(&camera_, nullptr), -1);
}

TEST_F(ACTiTest, FailedConnectionIsLoggedWithoutThePassword) {
  // A bound socket that never listens: connecting to it is refused.
  int fd = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  ASSERT_EQ(bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
  socklen_t length = sizeof(address);
  ASSERT_EQ(getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length), 0);
  Camera camera = MakeCamera("admin", "s3cr3t-pw");

  LogCapture log;
  ACTiSocket socket("127.0.0.1", ntohs(address.sin_port), 1, false);
  int result = ControlConnectAuth(&camera, &socket);
  std::string text = log.Take();
  close(fd);
  EXPECT_EQ(result, -1);
  EXPECT_NE(text.find("actidetector:"), std::string::npos) << text;
  EXPECT_NE(text.find(":ControlConnectAuth(): Socket connection failed! "), std::string::npos)
      << text;
  EXPECT_EQ(text.find("s3cr3t-pw"), std::string::npos);
}

TEST_F(ACTiTest, LoginTurnsKeepAliveOn) {
  RawTcpServer control([](RawConnection& c) {
    AnswerLogin(c);
    HoldOpen(c);
  });
  ProbeSocket socket("127.0.0.1", control.Port(), 1, false);
  ASSERT_EQ(ControlConnectAuth(&camera_, &socket), 0);
  ASSERT_GE(socket.Fd(), 0);
  EXPECT_EQ(IntOption(socket.Fd(), SOL_SOCKET, SO_KEEPALIVE), 1);
  EXPECT_EQ(IntOption(socket.Fd(), IPPROTO_TCP, TCP_KEEPIDLE), 5);
  EXPECT_EQ(IntOption(socket.Fd(), IPPROTO_TCP, TCP_KEEPINTVL), 5);
  EXPECT_EQ(IntOption(socket.Fd(), IPPROTO_TCP, TCP_KEEPCNT), 3);
}

TEST_F(ACTiTest, KeepAliveOptionsAreSetInOrderUpToTheFirstRefused) {
  RawTcpServer control([](RawConnection& c) { HoldOpen(c); });
  const int defaultInterval = DefaultTcpOption(TCP_KEEPINTVL);
  const int defaultCount = DefaultTcpOption(TCP_KEEPCNT);
  ASSERT_NE(defaultInterval, 7);
  ASSERT_NE(defaultCount, 4);

  // The kernel refuses values below 1; what was set before the refused one stays, what comes
  // after it is never set, and the connection stays open.
  ProbeSocket idle("127.0.0.1", control.Port(), 1, false);
  EXPECT_EQ(idle.BuildConnectWithKeepAlive(0, 7, 4), -1);
  ASSERT_GE(idle.Fd(), 0);
  EXPECT_EQ(IntOption(idle.Fd(), SOL_SOCKET, SO_KEEPALIVE), 1);
  EXPECT_EQ(IntOption(idle.Fd(), IPPROTO_TCP, TCP_KEEPINTVL), defaultInterval);
  EXPECT_EQ(IntOption(idle.Fd(), IPPROTO_TCP, TCP_KEEPCNT), defaultCount);

  ProbeSocket interval("127.0.0.1", control.Port(), 1, false);
  EXPECT_EQ(interval.BuildConnectWithKeepAlive(6, 0, 4), -1);
  ASSERT_GE(interval.Fd(), 0);
  EXPECT_EQ(IntOption(interval.Fd(), IPPROTO_TCP, TCP_KEEPIDLE), 6);
  EXPECT_EQ(IntOption(interval.Fd(), IPPROTO_TCP, TCP_KEEPCNT), defaultCount);

  ProbeSocket count("127.0.0.1", control.Port(), 1, false);
  EXPECT_EQ(count.BuildConnectWithKeepAlive(6, 7, 0), -1);
  ASSERT_GE(count.Fd(), 0);
  EXPECT_EQ(IntOption(count.Fd(), IPPROTO_TCP, TCP_KEEPIDLE), 6);
  EXPECT_EQ(IntOption(count.Fd(), IPPROTO_TCP, TCP_KEEPINTVL), 7);

  ProbeSocket all("127.0.0.1", control.Port(), 1, false);
  EXPECT_EQ(all.BuildConnectWithKeepAlive(6, 7, 4), 0);
  EXPECT_EQ(IntOption(all.Fd(), IPPROTO_TCP, TCP_KEEPCNT), 4);

  ProbeSocket nowhere("127.0.0.1", 0, 1, false);
  EXPECT_NE(nowhere.BuildConnectWithKeepAlive(5, 5, 3), 0);
  EXPECT_LT(nowhere.Fd(), 0);
}

TEST_F(ACTiTest, MotionRecordWithPayloadLengthZeroIsMotion) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(kMotion, 0) + Record(48, 0));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  EXPECT_EQ(Read(detector), kMotionReading);
  // Had a payload been read for it, the next record would have gone with it.
  EXPECT_EQ(Read(detector), kQuietReading);
  EXPECT_EQ(control.Connections(), 1);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPortPath}));
}

TEST_F(ACTiTest, OtherRecordTypesAreNoMotionAndKeepTheConnection) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(48, 0) + Record(kMotion - 1, 4, "abcd") + Record(kMotion + 1, 2, "zz") +
            Record(0x39000100u, 0) + Record(0, 3, "xyz") + Record(kMotion, 5, "hello"));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  for (int i = 0; i < 5; ++i) EXPECT_EQ(Read(detector), kQuietReading) << "record " << i;
  EXPECT_EQ(Read(detector), kMotionReading);
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, NothingArrivingIsNoMotionAndKeepsTheConnection) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(kMotion, 0));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  EXPECT_EQ(Read(detector), kQuietReading);
  gate.Open();
  EXPECT_EQ(Read(detector), kMotionReading);
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, ElevenByteHeaderDropsTheConnection) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(kMotion, 0).substr(0, 11));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  EXPECT_EQ(Read(detector), kLost);
  EXPECT_EQ(Read(detector), kLost) << "the connection is gone";
  EXPECT_EQ(detector.SendLiveReq(), -1);
  // The next attempt asks for the port again and opens a new connection.
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  EXPECT_EQ(control.Connections(), 2);
  EXPECT_EQ(cam_.Count(kPortPath), 2);
}

TEST_F(ACTiTest, PayloadLength1000IsReadAs256AndTheRestIsTheNextHeader) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    std::string payload = std::string(256, 'x') + Record(kMotion, 0);
    payload += std::string(1000 - payload.size(), '\0');
    c.Write(Record(7, 1000, payload));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  EXPECT_EQ(Read(detector), kQuietReading);
  EXPECT_EQ(Read(detector), kMotionReading) << "bytes 256..267 of the payload as a header";
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, NegativePayloadLengthSkipsThePayloadRead) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(kMotion, -1) + Record(9, 0) + Record(48, -1) + Record(kMotion, 0));
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  EXPECT_EQ(Read(detector), kMotionReading);
  EXPECT_EQ(Read(detector), kQuietReading);
  EXPECT_EQ(Read(detector), kQuietReading);
  EXPECT_EQ(Read(detector), kMotionReading);
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, MissingPayloadOrClosedConnectionIsLost) {
  Gate gate;
  RawTcpServer control([&gate](RawConnection& c) {
    if (!AnswerLogin(c) || !gate.Wait()) return;
    c.Write(Record(kMotion, 10));  // the payload never comes
    HoldOpen(c);
  });
  PointAt(control);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  gate.Open();
  EXPECT_EQ(Read(detector), kLost);

  RawTcpServer closing([](RawConnection& c) { AnswerLogin(c); });
  PointAt(closing);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  EXPECT_EQ(Read(detector), kLost);
}

TEST_F(ACTiTest, ReadWithoutConnectionIsLost) {
  ACTiMD detector(&camera_);
  EXPECT_EQ(Read(detector), kLost);
  EXPECT_EQ(detector.SendLiveReq(), -1);
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(ACTiTest, FailedAttemptsLeaveNoConnection) {
  cam_.Answer(kPortPath, Respond(500, "text/plain", ""));
  ACTiMD detector(&camera_);
  EXPECT_EQ(detector.OpenControlConnection(), -1);
  RawTcpServer refusing([](RawConnection& c) { AnswerLogin(c, "\x01"); });
  PointAt(refusing);
  EXPECT_EQ(detector.OpenControlConnection(), -1);
  EXPECT_EQ(Read(detector), kLost);
  EXPECT_EQ(refusing.Connections(), 1);
}

TEST_F(ACTiTest, LiveRequestIsDueTwentySecondsAfterTheLastOne) {
  FakeClock clock(1000000000000LL);
  ACTiMD detector(&camera_);
  detector.SetTimeSource(clock.Source());
  detector.ResetLiveReqTimeout();
  clock.Set(1000000000000LL + 19999999);
  EXPECT_EQ(detector.CheckLiveReqTimeout(), 0);
  clock.Set(1000000000000LL + 20000000);
  EXPECT_EQ(detector.CheckLiveReqTimeout(), 1);
  EXPECT_EQ(detector.CheckLiveReqTimeout(), 0) << "due again only 20 s later";
  clock.Set(1000000000000LL + 40000000);
  EXPECT_EQ(detector.CheckLiveReqTimeout(), 1);
  // A clock set back counts as long past (the difference is compared unsigned).
  clock.Set(1000000000000LL);
  EXPECT_EQ(detector.CheckLiveReqTimeout(), 1);
}

TEST_F(ACTiTest, LiveRequestGoesOutTwentySecondsAfterTheLogin) {
  const long long login = 5000000000000LL;
  FakeClock clock(login);
  std::promise<void> closed;
  RawTcpServer control([&closed](RawConnection& c) {
    if (AnswerLogin(c)) {
      std::string request;
      while (c.ReadExactly(12, request, seconds(10))) {
      }
    }
    closed.set_value();
  });
  PointAt(control);
  auto detector = std::make_unique<ACTiMD>(&camera_);
  detector->SetTimeSource(clock.Source());
  ASSERT_EQ(detector->OpenControlConnection(), 0);
  clock.Set(login + 19999999);
  EXPECT_EQ(detector->SendLiveReq(), 0);
  clock.Set(login + 20000000);
  EXPECT_EQ(detector->SendLiveReq(), 0);
  EXPECT_EQ(detector->SendLiveReq(), 0);
  // Closing the connection lets the camera read everything that was sent, then see the end.
  detector.reset();
  ASSERT_EQ(closed.get_future().wait_for(seconds(15)), std::future_status::ready);
  EXPECT_EQ(control.Received(),
            (std::vector<std::string>{LoginPacket("admin", "123456"), kLiveRequest}));
}

// The loop sends the live request after a record read once its time has come.
TEST_F(ACTiTest, LoopSendsOneLiveRequestPerTwentySecondsOfItsClock) {
  const long long login = 7000000000000LL;
  FakeClock clock(login);
  RawTcpServer control([](RawConnection& c) {
    if (!AnswerLogin(c)) return;
    // A record every few milliseconds keeps the loop's passes short.
    while (c.Write(Record(1, 0))) {
      std::string request;
      if (!c.ReadExactly(12, request, milliseconds(20)) && !c.SleepFor(milliseconds(0))) return;
    }
  });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  detector.SetTimeSource(clock.Source());
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  auto passes = [&recorder](size_t more) {
    size_t target = recorder.Size() + more;
    return recorder.WaitForCount(target);
  };
  auto liveRequests = [&control] { return Count(control.Received(), kLiveRequest); };
  auto waitForLiveRequests = [&](int n) {
    const auto deadline = std::chrono::steady_clock::now() + seconds(10);
    while (liveRequests() < n && std::chrono::steady_clock::now() < deadline) {
      std::this_thread::sleep_for(milliseconds(10));
    }
    return liveRequests() >= n;
  };

  ASSERT_TRUE(passes(3));
  clock.Set(login + 19999999);
  ASSERT_TRUE(passes(3));
  EXPECT_EQ(liveRequests(), 0);
  clock.Set(login + 20000000);
  ASSERT_TRUE(waitForLiveRequests(1));
  ASSERT_TRUE(passes(5));
  EXPECT_EQ(liveRequests(), 1);
  clock.Set(login + 39999999);
  ASSERT_TRUE(passes(3));
  EXPECT_EQ(liveRequests(), 1);
  clock.Set(login + 40000000);
  ASSERT_TRUE(waitForLiveRequests(2));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(liveRequests(), 2);
  EXPECT_EQ(control.Connections(), 1);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

// The one test on the real clock: about 20 seconds long.
TEST_F(ACTiTest, LiveRequestOnTheRealClockComesTwentySecondsAfterTheLogin) {
  using Clock = std::chrono::steady_clock;
  std::promise<std::pair<std::string, Clock::duration>> first;
  RawTcpServer control([&first](RawConnection& c) {
    std::string login;
    if (!c.ReadExactly(128, login, seconds(5))) return;
    const Clock::time_point loggedIn = Clock::now();
    if (!c.Write(std::string(1, '\0'))) return;
    std::string request;
    c.ReadExactly(12, request, seconds(40));
    first.set_value({request, Clock::now() - loggedIn});
    HoldOpen(c);
  });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  auto result = first.get_future();
  ASSERT_EQ(result.wait_for(seconds(45)), std::future_status::ready);
  auto [request, after] = result.get();
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(request, kLiveRequest);
  // Nothing at all was sent before it: the first 12 bytes after the login are the request.
  EXPECT_GE(after, seconds(19));
  // The silent camera gave a (false, 0) reading about once a second meanwhile.
  EXPECT_GE(recorder.Size(), 5u);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, MotionLoopReportsRecordsThenQuietAndEndsWithFalse) {
  std::atomic<bool> moving{true};
  RawTcpServer control([&moving](RawConnection& c) {
    if (!AnswerLogin(c)) return;
    while (moving && c.SleepFor(milliseconds(50))) {
      if (!c.Write(Record(kMotion, 0))) return;
    }
    HoldOpen(c);
  });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  moving = false;
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& reports) {
    return reports.size() >= 2 && reports.back() == Report{false, 0} &&
           reports[reports.size() - 2] == Report{true, 100};
  }));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  EXPECT_EQ(control.Connections(), 1);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPortPath}));
  std::vector<std::string> received = control.Received();
  ASSERT_FALSE(received.empty());
  EXPECT_EQ(received[0], LoginPacket("admin", "123456"));
}

TEST_F(ACTiTest, ShortHeaderInTheLoopReconnectsAndReadsOn) {
  Gate gate;
  std::atomic<int> connection{0};
  RawTcpServer control([&gate, &connection](RawConnection& c) {
    int n = ++connection;
    if (!AnswerLogin(c)) return;
    if (n == 1) {
      if (!gate.Wait()) return;
      c.Write(Record(kMotion, 0).substr(0, 11));
      HoldOpen(c);
      return;
    }
    while (c.SleepFor(milliseconds(50)) && c.Write(Record(kMotion, 0))) {
    }
  });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  // A first quiet reading shows the login reply has been read.
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  gate.Open();
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(control.Connections(), 2);
  EXPECT_EQ(cam_.Count(kPortPath), 2);
  std::vector<Report> reports = recorder.Reports();
  auto motion = std::find(reports.begin(), reports.end(), Report{true, 100});
  for (auto r = reports.begin(); r != motion; ++r) EXPECT_EQ(*r, (Report{false, 0}));
}

TEST_F(ACTiTest, RefusedLoginsAreRetriedOnceASecondAndReportNothing) {
  RawTcpServer control([](RawConnection& c) { AnswerLogin(c, "\x01"); });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  const auto started = std::chrono::steady_clock::now();
  ASSERT_EQ(detector.Start(), 0);
  const auto deadline = started + seconds(20);
  while (control.Connections() < 3 && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(milliseconds(20));
  }
  auto stopped = std::async(std::launch::async, [&detector] { return detector.Stop(); });
  ASSERT_EQ(stopped.wait_for(seconds(15)), std::future_status::ready) << "Stop did not return";
  EXPECT_EQ(stopped.get(), 0);
  const double elapsed =
      std::chrono::duration<double>(std::chrono::steady_clock::now() - started).count();

  // The last attempt's connection may still wait to be accepted.
  const auto settle = std::chrono::steady_clock::now() + seconds(5);
  while (control.Connections() < cam_.Count(kPortPath) && std::chrono::steady_clock::now() < settle) {
    std::this_thread::sleep_for(milliseconds(10));
  }
  const int attempts = control.Connections();
  EXPECT_GE(attempts, 3);
  // A second's pause after each refusal: no more attempts than whole seconds passed, plus one.
  EXPECT_LE(attempts, static_cast<int>(elapsed) + 1);
  EXPECT_EQ(cam_.Count(kPortPath), attempts) << "the port is asked before every attempt";
  for (const std::string& login : control.Received()) {
    EXPECT_EQ(login, LoginPacket("admin", "123456"));
  }
  EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 0}})) << "only the final report";
}

TEST_F(ACTiTest, FailedPortQueriesAreRetriedAndReportNothing) {
  cam_.Answer(kPortPath, Respond(404, "text/plain", ""));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(cam_.WaitForRequests(2));
  ASSERT_EQ(detector.Stop(), 0);
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kPortPath);
  EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 0}}));
}

TEST_F(ACTiTest, StopReturnsWhileTheCameraIsSilent) {
  RawTcpServer control([](RawConnection& c) {
    AnswerLogin(c);
    HoldOpen(c);
  });
  PointAt(control);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  auto stopped = std::async(std::launch::async, [&detector] { return detector.Stop(); });
  ASSERT_EQ(stopped.wait_for(seconds(15)), std::future_status::ready) << "Stop did not return";
  EXPECT_EQ(stopped.get(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_EQ(control.Connections(), 1);
}

TEST_F(ACTiTest, MotionDetectorWithoutCameraLogsAndReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiMD detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  LogCapture log;
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  std::string text = log.Take();
  EXPECT_NE(text.find("actidetector:"), std::string::npos) << text;
  EXPECT_NE(text.find(":EventDetecor(): No configure file or status buffer"), std::string::npos)
      << text;
  EXPECT_EQ(recorder.Size(), 0u);
}

class ACTiInputTest : public ACTiTest {
 protected:
  struct InputReading {
    int result;
    bool active;
  };
  InputReading Input(const std::string& value, int inputs) {
    cam_.Answer(kInputPath, Text("DIO_STATUS='" + value + "'\n\n"));
    ACTiEID detector(&camera_, inputs);
    InputReading r{0, true};
    r.result = detector.DoEID(r.active);
    return r;
  }
  bool Active(const std::string& value, int inputs) {
    InputReading r = Input(value, inputs);
    EXPECT_EQ(r.result, 0) << value;
    return r.active;
  }
};

TEST_F(ACTiInputTest, OneInputIsActiveWhenBitZeroIsClear) {
  EXPECT_TRUE(Active("2", 1));
  EXPECT_FALSE(Active("1", 1));
  EXPECT_TRUE(Active("0", 1));
  EXPECT_FALSE(Active("3", 1));
  EXPECT_EQ(cam_.Count(kInputPath), 4);
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kInputPath);
}

TEST_F(ACTiInputTest, TwoInputsAreIdleOnlyForThree) {
  EXPECT_TRUE(Active("0", 2));
  EXPECT_TRUE(Active("1", 2));
  EXPECT_TRUE(Active("2", 2));
  EXPECT_FALSE(Active("3", 2));
}

TEST_F(ACTiInputTest, ThreeInputsReadThreeAsActive) {
  EXPECT_TRUE(Active("3", 3));
  EXPECT_TRUE(Active("7", 3)) << "bit 2 is masked away";
  EXPECT_TRUE(Active("F", 8));
}

TEST_F(ACTiInputTest, ValueIsBase16AndOnlyItsTwoLowestBitsCount) {
  EXPECT_FALSE(Active("1F", 2));
  EXPECT_FALSE(Active("ff", 2));
  EXPECT_TRUE(Active("1E", 1));
  EXPECT_TRUE(Active("10", 1)) << "hexadecimal 10 has bit 0 clear";
  EXPECT_FALSE(Active("0x3", 2));
}

TEST_F(ACTiInputTest, NoInputsAreNeverActive) {
  EXPECT_FALSE(Active("0", 0));
  EXPECT_FALSE(Active("0", -1));
}

TEST_F(ACTiInputTest, OverflowingValuesFail) {
  for (const char* value : {"7FFFFFFF", "80000000", "FFFFFFFF", "123456789ABCDEF0123",
                            "-80000000", "-FFFFFFFFF"}) {
    InputReading r = Input(value, 1);
    EXPECT_EQ(r.result, -1) << value;
    EXPECT_FALSE(r.active) << value;
  }
  EXPECT_TRUE(Active("7FFFFFFE", 1));
  EXPECT_FALSE(Active("-7FFFFFFF", 1));
}

TEST_F(ACTiInputTest, FailedRequestOrNoCameraFails) {
  cam_.Answer(kInputPath, Respond(500, "text/plain", "DIO_STATUS='0'\n\n"));
  ACTiEID detector(&camera_, 1);
  bool active = true;
  EXPECT_EQ(detector.DoEID(active), -1);
  EXPECT_FALSE(active);
  cam_.Answer(kInputPath, Respond(200, "application/json", "DIO_STATUS='0'\n\n"));
  active = true;
  EXPECT_EQ(detector.CheckDIStatusByCGI(active), -1);
  EXPECT_FALSE(active);
  ACTiEID none(nullptr, 1);
  EXPECT_EQ(none.DoEID(active), -1);
}

TEST_F(ACTiInputTest, LoopReportsReadingsWithValidityAndFinalFalse) {
  cam_.Answer(kInputPath, Text("DIO_STATUS='2'\n\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiEID detector(&camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(kInputPath, Text("DIO_STATUS='7FFFFFFF'\n\n"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  cam_.Answer(kInputPath, Text("DIO_STATUS='3'\n\n"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kInputPath);
}

TEST_F(ACTiInputTest, LoopWithoutCameraReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ACTiEID detector(nullptr, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

}  // namespace
