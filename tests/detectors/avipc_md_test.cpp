// AvipcMD against a fake camera that pushes motion data: the same machine as AxisMD, on the
// stream that the camera's API names.

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "detectors/avipc.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::MotionReading;
using evtest::Push;
using evtest::PushHandler;
using evtest::ReadMotionParts;
using evtest::Report;

const char kPath[] = "/cgi-bin/motion/motiondata.cgi";

std::string Line(char group, int level, int threshold) {
  return std::string("group=") + group + ";level=" + std::to_string(level) +
         ";threshold=" + std::to_string(threshold) + ";";
}

class AvipcMDTest : public ::testing::Test {
 protected:
  AvipcMDTest() {
    CameraAPIRecord record;
    record.stream = StreamLocation{kPath, cam_.Port()};
    api_ = std::make_unique<CameraAPI>(record);
  }
  MotionReading ReadOne(const std::string& body) {
    AvipcMD detector(&camera_, api_.get());
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  std::unique_ptr<CameraAPI> api_;
};

TEST_F(AvipcMDTest, LevelMustBeAboveThreshold) {
  EXPECT_EQ(ReadOne(Line('0', 10, 10)), (MotionReading{0, false, 10}));
  EXPECT_EQ(ReadOne(Line('0', 11, 10)), (MotionReading{0, true, 11}));
  EXPECT_EQ(ReadOne(Line('0', -1, 10)), (MotionReading{0, true, 4294967295u}));
}

TEST_F(AvipcMDTest, AnyOneCharacterGroupCounts) {
  EXPECT_EQ(ReadOne(Line('B', 11, 10)), (MotionReading{0, true, 11}));
}

TEST_F(AvipcMDTest, WithoutMotionTheLastLinesLevelIsReported) {
  EXPECT_EQ(ReadOne(Line('0', 30, 50) + "\r\n" + Line('1', 5, 50) + "\r\n"),
            (MotionReading{0, false, 5}));
}

TEST_F(AvipcMDTest, PartOf1025BytesIsReadWhole) {
  std::string body(1025 - Line('0', 60, 50).size(), '\n');
  body += Line('0', 60, 50);
  EXPECT_EQ(ReadOne(body), (MotionReading{0, true, 60}));
}

TEST_F(AvipcMDTest, LoopReportsEachPartFromTheApisStream) {
  cam_.Handle(kPath, PushHandler({Push{{Line('0', 60, 50), Line('0', 5, 50)},
                                       Push::kRepeatLast,
                                       std::chrono::milliseconds(5)}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  AvipcMD detector(&camera_, api_.get());
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 60}));
  EXPECT_EQ(reports[1], (Report{false, 5}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

TEST_F(AvipcMDTest, WithoutApiTheLoopEndsAtOnceReportingNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  AvipcMD detector(&camera_, nullptr);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
  EXPECT_TRUE(cam_.Targets().empty());
}

}  // namespace
