// The ACTi emulation: its two CGIs, its control port (login, motion and status records,
// answers to live requests), read by the ACTi detectors themselves and by a raw client.

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "detectors/acti/actidetector.h"
#include "framework/host/camera.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

std::string Le32(uint32_t value) {
  std::string bytes(4, '\0');
  for (int i = 0; i < 4; ++i) bytes[i] = static_cast<char>((value >> (8 * i)) & 0xff);
  return bytes;
}

std::string LoginPacket(const std::string& user, const std::string& password) {
  std::string packet(128, '\0');
  packet.replace(0, user.size(), user);
  packet.replace(32, 4, Le32(1));
  packet.replace(64, password.size(), password);
  return packet;
}

uint32_t TypeOf(const std::string& record) {
  uint32_t value = 0;
  for (int i = 3; i >= 0; --i) value = (value << 8) | static_cast<unsigned char>(record[4 + i]);
  return value;
}

class ActiEmulationTest : public ::testing::Test {
 protected:
  void Start(SimOptions options = {}) {
    options.emulations = {"acti"};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
  }
  Camera MakeCamera(const std::string& user = "", const std::string& password = "") {
    CameraRecord r;
    r.host = "127.0.0.1";
    r.port = cam_->port;
    r.username = user;
    r.password = password;
    return Camera(r);
  }
  Simulator sim_;
  const SimCamera* cam_ = nullptr;
};

TEST_F(ActiEmulationTest, ControlPortCgiTellsTheTcpServicesPort) {
  Start();
  ASSERT_GT(cam_->tcp_port, 0);
  EXPECT_NE(cam_->tcp_port, cam_->port);
  std::string raw =
      evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/cmd/system?PORT_CONTROL"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 200 OK\r\n", 0), 0u) << raw;
  EXPECT_NE(raw.find("\r\n\r\nPORT_CONTROL='" + std::to_string(cam_->tcp_port) + "'\r\n\r\n"),
            std::string::npos)
      << raw;
  Camera camera = MakeCamera();
  int port = 0;
  ASSERT_EQ(GetControlPort(&camera, port), 0);
  EXPECT_EQ(port, cam_->tcp_port);
}

TEST_F(ActiEmulationTest, InputCgiClearsTheBitOfAnActiveInput) {
  Start();
  auto status = [this] {
    return evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/cmd/mpeg4?DIO_STATUS"));
  };
  EXPECT_NE(status().find("\r\n\r\nDIO_STATUS='03'\r\n\r\n"), std::string::npos) << status();
  cam_->state->SetInput(2, true);
  EXPECT_NE(status().find("DIO_STATUS='01'"), std::string::npos) << status();
  cam_->state->SetInput(1, true);
  EXPECT_NE(status().find("DIO_STATUS='00'"), std::string::npos) << status();

  Camera camera = MakeCamera();
  bool active = false;
  cam_->state->SetAllInputs(false);
  ASSERT_EQ(ACTiEID(&camera, 2).DoEID(active), 0);
  EXPECT_FALSE(active);
  cam_->state->SetInput(1, true);
  ASSERT_EQ(ACTiEID(&camera, 2).DoEID(active), 0);
  EXPECT_TRUE(active);
}

TEST_F(ActiEmulationTest, OtherPathsAreNotFound) {
  Start();
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/cmd/system"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 404", 0), 0u) << raw;
}

TEST_F(ActiEmulationTest, ACTiMDSeesMotionRecordsWhileTheCameraSeesMotion) {
  Start();
  Camera camera = MakeCamera("admin", "123456");
  ACTiMD detector(&camera);
  ASSERT_EQ(detector.OpenControlConnection(), 0);
  bool detected = true;
  unsigned int level = 9;
  ASSERT_EQ(detector.DoMD(detected, level), 0);
  EXPECT_FALSE(detected);
  cam_->state->SetMotion(40);
  for (int i = 0; i < 20 && !detected; ++i) ASSERT_EQ(detector.DoMD(detected, level), 0);
  EXPECT_TRUE(detected);
  EXPECT_EQ(level, 100u);
}

TEST_F(ActiEmulationTest, LoginIsCheckedWhenCredentialsAreSet) {
  SimOptions options;
  options.auth = AuthScheme::kDigest;
  options.user = "admin";
  options.password = std::string(70, 'p');
  Start(options);
  Camera wrong = MakeCamera("admin", "nope");
  ACTiMD refused(&wrong);
  EXPECT_EQ(refused.OpenControlConnection(), -1) << "the port CGI asks for credentials too";

  evtest::LoopbackClient client(cam_->tcp_port);
  ASSERT_TRUE(client.Send(LoginPacket("admin", "nope")));
  std::string reply = client.ReadAll(seconds(5));
  ASSERT_EQ(reply.size(), 128u);
  EXPECT_EQ(reply[0], '\x01');

  Camera right = MakeCamera("admin", std::string(70, 'p'));
  ACTiMD accepted(&right);
  EXPECT_EQ(accepted.OpenControlConnection(), 0) << "a password cut to 63 characters matches";
}

TEST_F(ActiEmulationTest, LiveRequestIsAnsweredAndMotionBringsMotionRecords) {
  Start();
  evtest::LoopbackClient client(cam_->tcp_port);
  ASSERT_TRUE(client.Send(LoginPacket("", "")));
  std::string reply = client.ReadUntil(std::string(128, '\0'), seconds(5));
  ASSERT_EQ(reply, std::string(128, '\0'));
  ASSERT_TRUE(client.Send(std::string("ACTi\x30\0\0\0\0\0\0\0", 12)));
  std::string answer = client.ReadUntil(std::string("ACTi\x30\0\0\0\0\0\0\0", 12), seconds(5));
  EXPECT_EQ(answer, std::string("ACTi\x30\0\0\0\0\0\0\0", 12));
  cam_->state->SetMotion(100);
  std::string motion = client.ReadUntil(Le32(65593), seconds(5));
  ASSERT_GE(motion.size(), 12u);
  EXPECT_EQ(motion.substr(0, 4), "ACTi");
  EXPECT_EQ(TypeOf(motion), 65593u);
  EXPECT_GE(cam_->state->Requests(), 1u);
}

TEST_F(ActiEmulationTest, ASilentCameraAnswersNoLogin) {
  Start();
  cam_->state->SetSilent(true);
  evtest::LoopbackClient client(cam_->tcp_port);
  ASSERT_TRUE(client.Send(LoginPacket("", "")));
  EXPECT_EQ(client.ReadAll(milliseconds(1500)), "");
  EXPECT_GE(cam_->state->Requests(), 1u);
}

}  // namespace
}  // namespace evsim
