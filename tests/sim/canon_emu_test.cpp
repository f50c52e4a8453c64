// The Canon emulation, read by the Canon detectors themselves and by raw requests.

#include <gtest/gtest.h>

#include "detectors/canon.h"
#include "framework/host/camera.h"
#include "framework/host/httpclient.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

class CanonEmulationTest : public ::testing::Test {
 protected:
  void Start(SimOptions options = {}) {
    options.emulations = {"canon"};
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

TEST_F(CanonEmulationTest, AnswersInfoCgiAsPlainTextLines) {
  Start();
  cam_->state->SetMotion(30);
  cam_->state->SetInput(2, true);
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/-wvhttp-01-/info.cgi"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 200 OK\r\n", 0), 0u) << raw;
  EXPECT_NE(raw.find("Content-Type: text/plain\r\n"), std::string::npos) << raw;
  EXPECT_NE(raw.find("\r\nm.1:=1\r\n"), std::string::npos) << raw;
  EXPECT_NE(raw.find("\r\ni.1:=0\r\ni.2:=1\r\n"), std::string::npos) << raw;
  EXPECT_EQ(raw.find("\r\n\r\n\r\n"), std::string::npos) << "no empty line inside the body";
}

TEST_F(CanonEmulationTest, OtherPathsAreNotFound) {
  Start();
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/-wvhttp-01-/control.cgi"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 404", 0), 0u) << raw;
  EXPECT_EQ(cam_->state->Requests(), 1u);
}

TEST_F(CanonEmulationTest, CanonMDReadsTheMotionState) {
  Start();
  Camera camera = MakeCamera();
  CanonMD md(&camera);
  bool state = true;
  unsigned int level = 7;
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  cam_->state->SetMotion(55);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(level, 100u);
}

TEST_F(CanonEmulationTest, CanonEIDSeesAnyActiveInput) {
  Start();
  Camera camera = MakeCamera();
  CanonEID eid(&camera, 1);
  bool state = true;
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_FALSE(state);
  cam_->state->SetInput(3, true);
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_TRUE(state);
  cam_->state->SetAllInputs(false);
  cam_->state->SetInput(5, true);  // beyond the camera's four inputs: not shown
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_FALSE(state);
}

TEST_F(CanonEmulationTest, CredentialsAreAskedForWhenSet) {
  SimOptions options;
  options.auth = AuthScheme::kDigest;
  options.user = "root";
  options.password = "s:cret";
  Start(options);
  cam_->state->SetMotion(100);
  bool state = false;
  unsigned int level = 0;
  Camera wrong = MakeCamera("root", "nope");
  EXPECT_EQ(CanonMD(&wrong).DoMD(state, level), -1);
  Camera right = MakeCamera("root", "s:cret");
  ASSERT_EQ(CanonMD(&right).DoMD(state, level), 0);
  EXPECT_TRUE(state);
}

TEST_F(CanonEmulationTest, ASilentCameraAnswersNothing) {
  Start();
  cam_->state->SetSilent(true);
  VoHttpClient client("127.0.0.1", cam_->port, "/-wvhttp-01-/info.cgi", "", "", 1);
  EXPECT_NE(client.SendRequest(VO_HTTP_GET), 0);
  EXPECT_GE(cam_->state->Requests(), 1u);
}

}  // namespace
}  // namespace evsim
