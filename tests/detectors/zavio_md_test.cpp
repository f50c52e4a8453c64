// ZavioMD against a fake camera that pushes motion data: the largest level without motion,
// the scaling of "zaviovga" cameras, and the stream loop.

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "detectors/zavio.h"
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

std::string Line(int level, int threshold) {
  return "group=0;level=" + std::to_string(level) + ";threshold=" + std::to_string(threshold) + ";";
}

class ZavioMDTest : public ::testing::Test {
 protected:
  std::unique_ptr<CameraAPI> Api(const std::string& name) {
    CameraAPIRecord record;
    record.api = name;
    record.stream = StreamLocation{kPath, cam_.Port()};
    return std::make_unique<CameraAPI>(record);
  }
  MotionReading ReadOne(const std::string& body, const std::string& api_name = "zavio") {
    std::unique_ptr<CameraAPI> api = Api(api_name);
    ZavioMD detector(&camera_, api.get());
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(ZavioMDTest, WithoutMotionTheLargestLevelIsReported) {
  EXPECT_EQ(ReadOne(Line(30, 50) + "\r\n" + Line(5, 50) + "\r\n"), (MotionReading{0, false, 30}));
  EXPECT_EQ(ReadOne(Line(5, 50) + "\r\n" + Line(30, 50) + "\r\n" + Line(7, 50)),
            (MotionReading{0, false, 30}));
}

TEST_F(ZavioMDTest, LargestIsTakenUnsignedAndZeroWithoutMatchingLines) {
  EXPECT_EQ(ReadOne("status=ok\r\nhello\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(ReadOne(""), (MotionReading{0, false, 0}));
  // A level of -1 is motion, whatever the threshold, and is reported as it stands.
  EXPECT_EQ(ReadOne(Line(30, 50) + "\n" + Line(-1, 50)), (MotionReading{0, true, 4294967295u}));
}

TEST_F(ZavioMDTest, MotionReportsTheLevelOfTheLineThatShowsIt) {
  EXPECT_EQ(ReadOne(Line(40, 50) + "\n" + Line(11, 10) + "\n" + Line(45, 50)),
            (MotionReading{0, true, 11}));
  EXPECT_EQ(ReadOne(Line(10, 10)), (MotionReading{0, false, 10}));
}

TEST_F(ZavioMDTest, LineEndingBeforeItsFirstFieldStopsWithTheLargestSoFar) {
  EXPECT_EQ(ReadOne(Line(30, 50) + "\ngroup=\n" + Line(45, 50)), (MotionReading{0, false, 30}));
}

TEST_F(ZavioMDTest, NegativeLengthSetsLevelZero) {
  std::unique_ptr<CameraAPI> api = Api("zavio");
  ZavioMD detector(&camera_, api.get());
  std::string body = Line(60, 50);
  unsigned int level = 77;
  EXPECT_EQ(detector.IsMotionDetected(&body[0], -1, level), 0);
  EXPECT_EQ(level, 0u);
}

TEST_F(ZavioMDTest, ZaviovgaLevelsAreCappedAt1000AndDividedBy10) {
  EXPECT_EQ(ReadOne(Line(1500, 200), "zaviovga"), (MotionReading{0, true, 100}));
  EXPECT_EQ(ReadOne(Line(555, 200), "zaviovga"), (MotionReading{0, true, 55}));
  EXPECT_EQ(ReadOne(Line(150, 200) + "\n" + Line(99, 200), "zaviovga"),
            (MotionReading{0, false, 15}));
  EXPECT_EQ(ReadOne(Line(-1, 200), "zaviovga"), (MotionReading{0, true, 100}));
}

TEST_F(ZavioMDTest, OtherApisKeepTheCamerasLevel) {
  EXPECT_EQ(ReadOne(Line(1500, 200), "zavio"), (MotionReading{0, true, 1500}));
  EXPECT_EQ(ReadOne(Line(555, 200), "ZAVIOVGA"), (MotionReading{0, true, 555}));
}

TEST_F(ZavioMDTest, FailedReadingIsNotScaled) {
  std::unique_ptr<CameraAPI> api = Api("zaviovga");
  ZavioMD detector(&camera_, api.get());
  bool motion = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(nullptr, motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
}

TEST_F(ZavioMDTest, LoopReportsScaledLevels) {
  cam_.Handle(kPath, PushHandler({Push{{Line(1500, 200), Line(120, 200) + "\n" + Line(80, 200)},
                                       Push::kRepeatLast,
                                       std::chrono::milliseconds(5)}}));
  std::unique_ptr<CameraAPI> api = Api("zaviovga");
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ZavioMD detector(&camera_, api.get());
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 12}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

}  // namespace
