// OnvifMD and OnvifEID against the simulator's event-service device over loopback.

#include "detectors/onvif.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>

#include "framework/host/eventbuf.h"
#include "sim/camstate.h"
#include "sim/makers/onvif_emu.h"
#include "sim/net/httpserver.h"
#include "tests/support/eventrecorder.h"

namespace {

using evtest::Report;

constexpr char kUser[] = "operator";
constexpr char kPassword[] = "Pa55-onvif-x";

class OnvifDetectorTest : public ::testing::Test {
 protected:
  void StartDevice(evsim::OnvifDeviceOptions options = {}) {
    options.user = kUser;
    options.password = kPassword;
    device_ = std::make_unique<evsim::OnvifDevice>(options, &state_);
    server_ = std::make_unique<evsim::HttpServer>(
        [this](evsim::HttpConnection& c) { device_->Handle(c); });
    ASSERT_GT(server_->Port(), 0);
  }
  std::unique_ptr<Camera> MakeCamera(const std::string& password = kPassword,
                                     const std::string& channel = "1") const {
    CameraRecord record;
    record.channel = channel;
    record.host = "127.0.0.1";
    record.port = server_->Port();
    record.username = kUser;
    record.password = password;
    return std::make_unique<Camera>(record);
  }
  void TearDown() override {
    if (server_) server_->Stop();
  }

  evsim::CameraState state_;
  std::unique_ptr<evsim::OnvifDevice> device_;
  std::unique_ptr<evsim::HttpServer> server_;
};

TEST_F(OnvifDetectorTest, MotionReadingFollowsTheCamera) {
  StartDevice();
  state_.SetMotion(60);
  auto camera = MakeCamera();
  OnvifMD md(camera.get());
  md.SetPullTimeout(5);
  bool motion = false;
  unsigned int level = 7;
  ASSERT_EQ(md.DoMD(motion, level), 0) << md.LastError();
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 100u);
  state_.SetMotion(0);
  ASSERT_EQ(md.DoMD(motion, level), 0) << md.LastError();
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 1);
  EXPECT_EQ(device_->Count("PullMessages"), 2);
}

TEST_F(OnvifDetectorTest, MotionFromTheVideoSourceAlarmTopic) {
  evsim::OnvifDeviceOptions options;
  options.cell_motion = false;
  options.motion_alarm = true;
  StartDevice(options);
  state_.SetMotion(30);
  auto camera = MakeCamera();
  OnvifMD md(camera.get());
  bool motion = false;
  unsigned int level = 0;
  ASSERT_EQ(md.DoMD(motion, level), 0) << md.LastError();
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 100u);
}

TEST_F(OnvifDetectorTest, MotionFollowsTheChannelsVideoSourceOnly) {
  evsim::OnvifDeviceOptions options;
  options.second_source = true;
  options.motion_alarm = true;
  StartDevice(options);
  state_.SetMotion(40);  // source 1 moves, source 2 says the opposite
  auto first = MakeCamera(kPassword, "1");
  auto second = MakeCamera(kPassword, "2");
  OnvifMD md1(first.get());
  OnvifMD md2(second.get());
  md1.SetPullTimeout(2);
  bool motion = false;
  unsigned int level = 0;
  ASSERT_EQ(md1.DoMD(motion, level), 0) << md1.LastError();
  EXPECT_TRUE(motion);
  ASSERT_EQ(md2.DoMD(motion, level), 0) << md2.LastError();
  EXPECT_FALSE(motion);
  state_.SetMotion(0);
  ASSERT_EQ(md1.DoMD(motion, level), 0) << md1.LastError();
  EXPECT_FALSE(motion);
  ASSERT_EQ(md2.DoMD(motion, level), 0) << md2.LastError();
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 100u);
}

TEST_F(OnvifDetectorTest, InputReadingIgnoresOtherInputs) {
  StartDevice();
  auto camera = MakeCamera();
  OnvifEID eid(camera.get(), 2);
  eid.SetPullTimeout(2);
  bool active = true;
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_FALSE(active);
  state_.SetInput(1, true);
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_FALSE(active);  // input 1 changed, not input 2
  state_.SetInput(2, true);
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_TRUE(active);
}

TEST_F(OnvifDetectorTest, MessageLimitSpreadsTheInitialStatesOverPulls) {
  StartDevice();
  state_.SetInput(2, true);
  auto camera = MakeCamera();
  OnvifEID eid(camera.get(), 2);
  eid.SetMessageLimit(1);
  eid.SetPullTimeout(1);
  // One message per pull: motion first, then input 1, then input 2.
  bool active = true;
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_FALSE(active);
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_FALSE(active);
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_TRUE(active);
  EXPECT_EQ(device_->Count("PullMessages"), 3);
}

TEST_F(OnvifDetectorTest, InitialInputStateIsReportedAtOnce) {
  StartDevice();
  state_.SetInput(1, true);
  auto camera = MakeCamera();
  OnvifEID eid(camera.get(), 1);
  bool active = false;
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_TRUE(active);
}

TEST_F(OnvifDetectorTest, LoopReportsAndUnsubscribesOnStop) {
  StartDevice();
  auto camera = MakeCamera();
  EventBuf buffer;
  evtest::EventRecorder recorder(buffer);
  OnvifMD md(camera.get());
  md.SetPullTimeout(30);  // Stop must not wait out the poll
  ASSERT_EQ(md.Init(&buffer, 50), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  state_.SetMotion(80);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  state_.SetMotion(0);
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) {
    return r.size() >= 3 && r.back() == Report{false, 0} && r[r.size() - 2] == Report{true, 100};
  }));
  ASSERT_EQ(md.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  EXPECT_EQ(device_->Count("Unsubscribe"), 1);
  EXPECT_EQ(device_->LiveSubscriptions(), 0);
  bool motion = true;
  unsigned int level = 1;
  EXPECT_EQ(md.DoMD(motion, level), -1);  // a stopped detector reads nothing
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
}

TEST_F(OnvifDetectorTest, DroppedSubscriptionIsReplaced) {
  StartDevice();
  state_.SetInput(1, true);
  auto camera = MakeCamera();
  EventBuf buffer;
  evtest::EventRecorder recorder(buffer);
  OnvifEID eid(camera.get(), 1);
  eid.SetPullTimeout(1);
  ASSERT_EQ(eid.Init(&buffer, 20), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  device_->DropSubscriptions();
  // The failed pull reads (false, 0), then a new subscription reads the input again.
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) {
    auto failed = std::find(r.begin(), r.end(), Report{false, 0});
    return failed != r.end() && std::find(failed, r.end(), Report{true, 1}) != r.end();
  }));
  EXPECT_GE(device_->Count("CreatePullPointSubscription"), 2);
  ASSERT_EQ(eid.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

TEST_F(OnvifDetectorTest, WrongPasswordReadsAFailure) {
  StartDevice();
  const std::string wrong = "not-the-Pa55";
  auto camera = MakeCamera(wrong);
  OnvifMD md(camera.get());
  bool motion = true;
  unsigned int level = 5;
  EXPECT_EQ(md.DoMD(motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  EXPECT_NE(md.LastError().find("NotAuthorized"), std::string::npos) << md.LastError();
  EXPECT_EQ(md.LastError().find(wrong), std::string::npos);

  EventBuf buffer;
  evtest::EventRecorder recorder(buffer);
  ASSERT_EQ(md.Init(&buffer, 20), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(md.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 0);
  EXPECT_GE(device_->Refused(), 2);
  for (const std::string& body : device_->Bodies()) {
    EXPECT_EQ(body.find(wrong), std::string::npos);
  }
}

TEST_F(OnvifDetectorTest, CameraClockAnHourOffStillReads) {
  evsim::OnvifDeviceOptions options;
  options.clock_offset = 3600;
  StartDevice(options);
  state_.SetMotion(50);
  auto camera = MakeCamera();
  OnvifMD md(camera.get());
  bool motion = false;
  unsigned int level = 0;
  ASSERT_EQ(md.DoMD(motion, level), 0) << md.LastError();
  EXPECT_TRUE(motion);
  EXPECT_EQ(device_->Refused(), 0);
}

TEST_F(OnvifDetectorTest, UnusualPrefixesStillRead) {
  evsim::OnvifDeviceOptions options;
  options.unusual_prefixes = true;
  StartDevice(options);
  state_.SetInput(1, true);
  auto camera = MakeCamera();
  OnvifEID eid(camera.get(), 1);
  bool active = false;
  ASSERT_EQ(eid.DoEID(active), 0) << eid.LastError();
  EXPECT_TRUE(active);  // the decoy under a foreign "tns1" says false
}

TEST_F(OnvifDetectorTest, NoCameraReadsAFailure) {
  OnvifMD md(nullptr);
  bool motion = true;
  unsigned int level = 3;
  EXPECT_EQ(md.DoMD(motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
}

}  // namespace
