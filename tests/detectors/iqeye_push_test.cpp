// IQeyeV1MD and IQeyeV2EID against a fake camera that pushes pictures, each followed by
// "Pragma: trigger=" lines before the next boundary.

#include "detectors/iqeye.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::FollowedAcrossOutage;
using evtest::InputReading;
using evtest::MotionReading;
using evtest::OutageHandler;
using evtest::Push;
using evtest::PushHandler;
using evtest::RawPart;
using evtest::ReadMotionParts;
using evtest::Report;

const char kMotionPush[] = "/now.jpg?snap=spush&pragma=motion";
const char kTriggerPush[] = "/now.jpg?snap=spush&pragma=trigger&noimage";

// A pushed picture of `size` bytes followed by the trigger line.
std::string Picture(const std::string& trigger, size_t size = 200) {
  return RawPart(std::string(size, 'J'), {}, "Pragma: trigger=" + trigger + "\r\n",
                 "image/jpeg");
}

class IQeyePushTest : public ::testing::Test {
 protected:
  // Pushes part and, to give its trailing text an end, the start of a next part; reads one.
  std::unique_ptr<MultipartFetch> PushOne(const char* target, const std::string& part) {
    Push push{{part, "--myboundary\r\n"}};
    push.raw = true;
    cam_.Handle(target, evtest::PushHandler({push}));
    return evtest::FetchFrom(cam_, target);
  }
  MotionReading Motion(const std::string& part) {
    IQeyeV1MD detector(&camera_);
    auto fetch = PushOne(kMotionPush, part);
    MotionReading r{0, true, 77};
    r.result = detector.DoMD(fetch.get(), r.motion, r.level);
    return r;
  }
  InputReading Input(const std::string& part, int inputs = 1) {
    IQeyeV2EID detector(&camera_, inputs);
    auto fetch = PushOne(kTriggerPush, part);
    InputReading r{0, true};
    r.result = detector.DoEID(fetch.get(), r.active);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(IQeyePushTest, TriggerTextIsLookedForAnywhereInTheValue) {
  EXPECT_EQ(Motion(Picture("motion,input1")), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input(Picture("motion,input1")), (InputReading{0, true}));
  EXPECT_EQ(Motion(Picture("input1")), (MotionReading{0, false, 0}));
  EXPECT_EQ(Input(Picture("motion")), (InputReading{0, false}));
}

TEST_F(IQeyePushTest, InputCountSelectsNothing) {
  EXPECT_EQ(Input(Picture("input7"), 1), (InputReading{0, true}));
  EXPECT_EQ(Input(Picture("input1"), 0), (InputReading{0, true}));
  EXPECT_EQ(Input(Picture("input1"), -3), (InputReading{0, true}));
}

TEST_F(IQeyePushTest, TriggerValueIsCutAt63Characters) {
  const std::string filler(57, 'x');
  EXPECT_EQ(Motion(Picture(filler + "motion")), (MotionReading{0, true, 100}))
      << "57 + 6 characters fit";
  EXPECT_EQ(Motion(Picture(filler + "xmotion")), (MotionReading{0, false, 0}))
      << "the 64th character is beyond the trigger buffer";
  EXPECT_EQ(Input(Picture(std::string(300, 'y') + "input1")), (InputReading{0, false}));
}

TEST_F(IQeyePushTest, TrailingTextLongerThanTheBufferIsCut) {
  // Trailing text of some 3000 bytes after a short picture and after a long one: what fits
  // in the fetcher's 1023 characters is judged, the rest is never seen.
  std::string late;
  for (int i = 0; i < 100; ++i) late += "Pragma: other=" + std::string(16, 'o') + "\r\n";
  late += "Pragma: trigger=motion\r\n";
  const std::string early = "Pragma: trigger=motion\r\n" + late;
  for (size_t size : {1100u, 3000u}) {
    EXPECT_EQ(Motion(RawPart(std::string(size, 'J'), {}, early, "image/jpeg")),
              (MotionReading{0, true, 100}))
        << size;
    EXPECT_EQ(Motion(RawPart(std::string(size, 'J'), {}, late, "image/jpeg")),
              (MotionReading{0, false, 0}))
        << size;
  }
}

TEST_F(IQeyePushTest, OnlyThePartsLengthIsJudged) {
  EXPECT_EQ(Motion(Picture("motion", 0)), (MotionReading{0, false, 0}))
      << "an empty body gives length 0";
  EXPECT_EQ(Input(Picture("input1", 0)), (InputReading{0, false}));
  EXPECT_EQ(Motion(Picture("motion", 10)), (MotionReading{0, false, 0}))
      << "10 bytes hold only the start of the trigger line";
  EXPECT_EQ(Motion(Picture("motion", 23)), (MotionReading{0, true, 100}));
}

TEST_F(IQeyePushTest, TriggerLineWithoutValueEndsTheScan) {
  EXPECT_EQ(Motion(RawPart(std::string(200, 'J'), {},
                           "Pragma: trigger=\r\nPragma: trigger=motion\r\n")),
            (MotionReading{0, false, 0}));
}

TEST_F(IQeyePushTest, FailedReadsAreFailedReadings) {
  IQeyeV1MD md(&camera_);
  bool motion = true;
  unsigned int level = 9;
  EXPECT_EQ(md.DoMD(nullptr, motion, level), -1);
  EXPECT_EQ(MotionReading({-1, motion, level}), (MotionReading{-1, false, 0}));
  IQeyeV2EID eid(&camera_, 1);
  bool active = true;
  EXPECT_EQ(eid.DoEID(nullptr, active), -1);
  EXPECT_FALSE(active);
  // A picture after which the camera closes: its trailing text never ends.
  cam_.Handle(kMotionPush, evtest::PushHandler({Push{{Picture("motion")}, Push::kClose, {}, "", 200, true}}));
  auto fetch = evtest::FetchFrom(cam_, kMotionPush);
  motion = true;
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), -1);
  EXPECT_FALSE(motion);
}

TEST_F(IQeyePushTest, MotionLoopReportsEachPartOnTheCamerasPort) {
  cam_.Handle(kMotionPush,
              evtest::PushHandler({Push{{Picture("motion"), Picture("none")}, Push::kRepeatLast,
                                        std::chrono::milliseconds(5), "", 200, true}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  IQeyeV1MD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kMotionPush}));
}

TEST_F(IQeyePushTest, InputLoopReportsValidityOnItsOwnPath) {
  cam_.Handle(kTriggerPush,
              evtest::PushHandler({Push{{Picture("input2"), Picture("none")}, Push::kRepeatLast,
                                        std::chrono::milliseconds(5), "", 200, true}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  IQeyeV2EID detector(&camera_, 4);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kTriggerPush}));
}

TEST_F(IQeyePushTest, WithoutCameraTheLoopsEndAtOnceReportingNothing) {
  IQeyeV1MD md(nullptr);
  IQeyeV2EID eid(nullptr, 1);
  for (DetectorBase* detector : std::vector<DetectorBase*>{&md, &eid}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
}

TEST_F(IQeyePushTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  {
    cam_.Handle(kMotionPush, OutageHandler({Picture("motion"), Picture("none")}, Picture("motion"), true));
    EventBuf buffer;
    EventRecorder recorder(buffer);
    IQeyeV1MD detector(&camera_);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.size() > 2 && r.back() == Report{true, 100}; }, std::chrono::seconds(20)));
    ASSERT_EQ(detector.Stop(), 0);
    EXPECT_TRUE(FollowedAcrossOutage(recorder.Reports(), Report{true, 100}, Report{true, 100}));
  }
  {
    cam_.Handle(kTriggerPush, OutageHandler({Picture("input1"), Picture("none")}, Picture("input1"), true));
    EventBuf buffer;
    EventRecorder recorder(buffer);
    IQeyeV2EID detector(&camera_, 1);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.size() > 2 && r.back() == Report{true, 1}; }, std::chrono::seconds(20)));
    ASSERT_EQ(detector.Stop(), 0);
    EXPECT_TRUE(FollowedAcrossOutage(recorder.Reports(), Report{true, 1}, Report{true, 1}));
  }
}

}  // namespace
