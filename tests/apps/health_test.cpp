// Camera health: the lines CameraHealth writes as transfers fail and succeed (with a clock the
// test moves), and evwatch run against cameras that cannot be reached: an unresolvable host,
// a refused port, a silent camera and wrong credentials, each named on stderr with its cause,
// the text output saying "unreachable", and the password nowhere.

#include "apps/evwatch/health.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <sstream>

#include "tests/apps/apptestutil.h"

namespace evwatch {
namespace {

using std::chrono::seconds;

Config TwoCameras() {
  std::string error;
  std::optional<Config> config = ParseConfig(R"(
cameras:
  - {name: door, host: 10.0.0.5, port: 8080, user: admin, password: s3cret,
     api: {stream: {path: /mjpg, port: 8081}}, detectors: [{class: AxisMD, name: motion}, {class: AXISEID, name: inputs}]}
  - {name: yard, host: 10.0.0.6, detectors: [{class: CanonMD}]}
)",
                                             "health.yaml", &error);
  EXPECT_TRUE(config.has_value()) << error;
  return config.value_or(Config{});
}

class CameraHealthTest : public ::testing::Test {
 protected:
  CameraHealthTest() : health_(TwoCameras(), log_, [this] { return now_; }) {}

  std::vector<std::string> Lines() {
    std::vector<std::string> lines;
    std::istringstream in(log_.str());
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
  }

  std::ostringstream log_;
  std::chrono::steady_clock::time_point now_ = std::chrono::steady_clock::time_point() + seconds(1000);
  CameraHealth health_;
};

TEST_F(CameraHealthTest, FailureIsSaidOnceAndTheAnswerAgain) {
  health_.OnTransfer({"10.0.0.5", 8080, false, "connection refused or host unreachable"});
  health_.OnTransfer({"10.0.0.5", 8080, false, "connection refused or host unreachable"});
  EXPECT_TRUE(health_.Failing("door"));
  EXPECT_FALSE(health_.Failing("yard"));
  health_.OnTransfer({"10.0.0.5", 8080, true, ""});
  EXPECT_FALSE(health_.Failing("door"));
  EXPECT_EQ(Lines(), (std::vector<std::string>{
                         "evwatch: camera door (10.0.0.5:8080) is failing: connection refused or host unreachable "
                         "(detectors: motion, inputs)",
                         "evwatch: camera door (10.0.0.5:8080) answers again"}));
}

TEST_F(CameraHealthTest, TheStreamPortCountsForItsCamera) {
  health_.OnTransfer({"10.0.0.5", 8081, false, "the stream ended or broke off"});
  EXPECT_TRUE(health_.Failing("door"));
  health_.OnTransfer({"10.0.0.6", 8081, false, "connection refused or host unreachable"});
  EXPECT_FALSE(health_.Failing("yard"));  // not yard's address
  EXPECT_EQ(Lines().size(), 1u);
}

TEST_F(CameraHealthTest, AFlappingCameraIsSaidAtMostOnceAMinutePerCause) {
  for (int i = 0; i < 5; ++i) {
    health_.OnTransfer({"10.0.0.6", 80, false, "HTTP 404 (no such path on the camera)"});
    health_.OnTransfer({"10.0.0.6", 80, true, ""});
    now_ += seconds(10);
  }
  // One failure line and its answer line; the flaps after it within the minute are quiet.
  EXPECT_EQ(Lines().size(), 2u);
  now_ += seconds(60);
  health_.OnTransfer({"10.0.0.6", 80, false, "HTTP 404 (no such path on the camera)"});
  EXPECT_EQ(Lines().size(), 3u);
  // Another cause is news at once.
  health_.OnTransfer({"10.0.0.6", 80, false, "no answer within 30 s"});
  ASSERT_EQ(Lines().size(), 4u);
  EXPECT_NE(Lines()[3].find("is failing: no answer within 30 s"), std::string::npos) << Lines()[3];
}

TEST_F(CameraHealthTest, NoLineEverHoldsThePassword) {
  health_.OnTransfer({"10.0.0.5", 8080, false, "HTTP 401 (credentials refused)"});
  health_.OnTransfer({"10.0.0.5", 8080, true, ""});
  ASSERT_FALSE(log_.str().empty());
  EXPECT_EQ(log_.str().find("s3cret"), std::string::npos);
  EXPECT_EQ(log_.str().find("admin"), std::string::npos);
}

}  // namespace
}  // namespace evwatch

namespace evtest {
namespace {

using std::chrono::seconds;

// A loopback port that was free a moment ago: bound, read and released.
int FreeLoopbackPort() {
  const int fd = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof(address);
  int port = 0;
  if (bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0 &&
      getsockname(fd, reinterpret_cast<sockaddr*>(&address), &size) == 0) {
    port = ntohs(address.sin_port);
  }
  close(fd);
  return port;
}

std::string Joined(const std::vector<std::string>& lines) {
  std::string all;
  for (const std::string& l : lines) all += l + "\n";
  return all;
}

// Runs evwatch on `config` in text format until stderr holds `expected`; then stops it and
// checks that the password is nowhere and that the text output said "unreachable".
void ExpectHealthLine(const TempDir& dir, const std::string& config, const std::string& expected) {
  const std::string file = dir.Write("health.yaml", config);
  ChildProcess evwatch({EvwatchPath(), "run", "--format", "text", "-c", file});
  ASSERT_TRUE(evwatch.Started());
  const bool said = evwatch.WaitForErr(
      [&](const auto& lines) { return Joined(lines).find(expected) != std::string::npos; }, seconds(60));
  EXPECT_TRUE(said) << "stderr:\n" << Joined(evwatch.Err());
  EXPECT_TRUE(evwatch.WaitForOut(
      [](const auto& lines) { return Joined(lines).find("unreachable") != std::string::npos; }, seconds(30)))
      << Joined(evwatch.Out());
  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
  EXPECT_EQ(Joined(evwatch.Err()).find("pa55word"), std::string::npos);
  EXPECT_EQ(Joined(evwatch.Out()).find("pa55word"), std::string::npos);
}

TEST(HealthRunTest, UnresolvableHostIsNamed) {
  TempDir dir;
  ExpectHealthLine(dir,
                   "cameras: [{name: gone, host: no-such-camera.invalid, user: u, password: pa55word, "
                   "detectors: [{class: CanonMD}]}]\n",
                   "evwatch: camera gone (no-such-camera.invalid:80) is failing: cannot resolve the host name "
                   "(detectors: CanonMD)");
}

TEST(HealthRunTest, RefusedPortIsNamed) {
  TempDir dir;
  // A port just taken and released: nothing listens there.
  const int port = FreeLoopbackPort();
  ExpectHealthLine(dir,
                   "cameras: [{name: shut, host: 127.0.0.1, port: " + std::to_string(port) +
                       ", user: u, password: pa55word, detectors: [{class: CanonMD}]}]\n",
                   "evwatch: camera shut (127.0.0.1:" + std::to_string(port) +
                       ") is failing: connection refused or host unreachable (detectors: CanonMD)");
}

TEST(HealthRunTest, WrongCredentialsAreNamedWithoutThePassword) {
  TempDir dir;
  Camsim sim(dir, {"-e", "canon", "--auth", "basic", "--user", "admin", "--password", "right"});
  ASSERT_TRUE(sim.Ready());
  const int port = sim.Cameras()[0]["port"].get<int>();
  ExpectHealthLine(dir,
                   "cameras: [{name: door, host: 127.0.0.1, port: " + std::to_string(port) +
                       ", user: admin, password: pa55word, detectors: [{class: CanonMD}]}]\n",
                   "is failing: HTTP 401 (credentials refused) (detectors: CanonMD)");
}

TEST(HealthRunTest, SilentCameraIsNamedAndItsAnswerToo) {
  TempDir dir;
  Camsim sim(dir, {"-e", "dlink"});
  ASSERT_TRUE(sim.Ready());
  const std::string camera = sim.Cameras()[0]["name"].get<std::string>();
  const int port = sim.Cameras()[0]["port"].get<int>();
  ASSERT_TRUE(sim.Set(camera, "silent=1"));
  const std::string file = dir.Write("health.yaml", "cameras: [{name: quiet, host: 127.0.0.1, port: " +
                                                        std::to_string(port) +
                                                        ", detectors: [{class: DLINKEID, inputs: 1}]}]\n");
  ChildProcess evwatch({EvwatchPath(), "run", "-c", file});
  ASSERT_TRUE(evwatch.Started());
  // D-Link's requests wait 10 s for an answer.
  EXPECT_TRUE(evwatch.WaitForErr(
      [](const auto& lines) { return Joined(lines).find("is failing: no answer within 10 s") != std::string::npos; },
      seconds(60)))
      << Joined(evwatch.Err());
  ASSERT_TRUE(sim.Set(camera, "silent=0"));
  EXPECT_TRUE(evwatch.WaitForErr(
      [](const auto& lines) {
        return Joined(lines).find("evwatch: camera quiet (127.0.0.1:") != std::string::npos &&
               Joined(lines).find(") answers again") != std::string::npos;
      },
      seconds(60)))
      << Joined(evwatch.Err());
  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
  // The JSON lines keep exactly their fields.
  for (const std::string& line : evwatch.Out()) {
    nlohmann::json j = nlohmann::json::parse(line, nullptr, false);
    ASSERT_TRUE(j.is_object()) << line;
    std::vector<std::string> keys;
    for (const auto& item : j.items()) keys.push_back(item.key());
    EXPECT_EQ(keys, (std::vector<std::string>{"camera", "class", "detector", "state", "ts", "value"})) << line;
  }
}

}  // namespace
}  // namespace evtest
