// The emulations of the cameras whose status CGI is polled as text (Mobotix, MessoaPro, the
// storage boxes, Brickcom, Arecont), read by their own detectors and by raw requests.

#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "detectors/arecont.h"
#include "detectors/brickcom.h"
#include "detectors/messoapro.h"
#include "detectors/mobotix.h"
#include "detectors/storage.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

class StatusCgiEmulationTest : public ::testing::Test {
 protected:
  void Start(const std::string& key) {
    SimOptions options;
    options.emulations = {key};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
    CameraRecord r;
    r.host = "127.0.0.1";
    r.port = cam_->port;
    camera_ = std::make_unique<Camera>(r);
    CameraAPIRecord api;
    if (cam_->emulation->api) {
      const nlohmann::json block = cam_->emulation->api(cam_->port);
      api.stream = StreamLocation{block["stream"]["path"].get<std::string>(), block["stream"]["port"].get<int>()};
    }
    api_ = std::make_unique<CameraAPI>(api);
  }
  std::string Raw(const std::string& target) { return evtest::Exchange(cam_->port, evtest::GetRequest(target)); }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  std::unique_ptr<Camera> camera_;
  std::unique_ptr<CameraAPI> api_;
};

TEST_F(StatusCgiEmulationTest, MobotixCounterMovesWhileTheEventIsOn) {
  Start("mobotix");
  MobotixMD motion(camera_.get(), EVENT_DET_MOTION);
  MobotixMD input(camera_.get(), EVENT_DET_INPUT);
  bool state = true;
  unsigned int level = 9;
  ASSERT_EQ(motion.DoMD(state, level), 0);
  EXPECT_FALSE(state) << "the counter starts at 0 and stands still";
  cam_->state->SetMotion(40);
  for (int i = 0; i < 2; ++i) {
    ASSERT_EQ(motion.DoMD(state, level), 0);
    EXPECT_TRUE(state);
    EXPECT_EQ(level, 100u);
  }
  ASSERT_EQ(input.DoMD(state, level), 0);
  EXPECT_FALSE(state) << "the input's counter is its own";
  cam_->state->SetMotion(0);
  cam_->state->SetInput(1, true);
  ASSERT_EQ(motion.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  ASSERT_EQ(input.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(level, 1u);
  EXPECT_EQ(Raw("/control/event.jpg?output=alarmupdate").rfind("HTTP/1.1 404", 0), 0u);
}

TEST_F(StatusCgiEmulationTest, MessoaProStatusNumber) {
  Start("messoapro");
  MessoaProMD md(camera_.get(), api_.get());
  MessoaProEID eid(camera_.get(), api_.get(), 1);
  cam_->state->SetMotion(10);
  const std::string raw = Raw("/cgi-bin/status.cgi?group=Alarm");
  EXPECT_NE(raw.find("\r\n\r\nAlarm.Enable=1\nAlarm.Status=2\n"), std::string::npos) << raw;
  bool state = false;
  unsigned int level = 0;
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_FALSE(state);
  cam_->state->SetMotion(0);
  cam_->state->SetInput(1, true);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_TRUE(state);
}

TEST_F(StatusCgiEmulationTest, StorageStatusNumberHasTheOtherBitsAndASemicolon) {
  Start("storage");
  cam_->state->SetInput(1, true);
  const std::string raw = Raw("/cgi-bin/alarm.cgi?action=status");
  EXPECT_NE(raw.find("alarm_status=2;\n"), std::string::npos) << raw;
  StorageMD md(camera_.get(), api_.get());
  StorageEID eid(camera_.get(), api_.get(), 1);
  bool state = false;
  unsigned int level = 0;
  ASSERT_EQ(eid.DoEID(state), 0);
  EXPECT_TRUE(state);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  cam_->state->SetMotion(100);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_TRUE(state);
}

TEST_F(StatusCgiEmulationTest, BrickcomInputsReadZeroWhileActive) {
  Start("brickcom");
  cam_->state->SetInput(2, true);
  const std::string raw = Raw("/cgi-bin/gpio.cgi?action=get");
  EXPECT_NE(raw.find("di1.status=1\ndi2.status=0\n"), std::string::npos) << raw;
  BrickcomEID one(camera_.get(), api_.get(), 1);
  BrickcomEID two(camera_.get(), api_.get(), 2);
  bool state = true;
  ASSERT_EQ(one.DoEID(state), 0);
  EXPECT_FALSE(state);
  ASSERT_EQ(two.DoEID(state), 0);
  EXPECT_TRUE(state);
}

TEST_F(StatusCgiEmulationTest, ArecontMdresult) {
  Start("arecont");
  ARECONTMD md(camera_.get(), api_.get());
  bool state = true;
  unsigned int level = 5;
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  cam_->state->SetMotion(1);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(level, 100u);
  EXPECT_EQ(Raw("/motion?other").rfind("HTTP/1.1 404", 0), 0u);
}

}  // namespace
}  // namespace evsim
