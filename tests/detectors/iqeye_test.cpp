// IQeyeV2MD against a fake camera that pushes motion data at now.motiondata on the camera's
// own port, with numbered windows and no trailing semicolon.

#include "detectors/iqeye.h"

#include <gtest/gtest.h>

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
using evtest::MotionReading;
using evtest::Push;
using evtest::PushHandler;
using evtest::ReadMotionParts;
using evtest::Report;

const char kPath[] = "/now.motiondata";

class IQeyeV2MDTest : public ::testing::Test {
 protected:
  MotionReading ReadOne(const std::string& body) {
    IQeyeV2MD detector(&camera_);
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(IQeyeV2MDTest, WindowLinesAreRead) {
  EXPECT_EQ(ReadOne("window=1;level=11;threshold=10"), (MotionReading{0, true, 11}));
  EXPECT_EQ(ReadOne("window=1;level=10;threshold=10"), (MotionReading{0, false, 10}));
  EXPECT_EQ(ReadOne("window=2;level=-1;threshold=10\r\n"), (MotionReading{0, true, 4294967295u}));
}

TEST_F(IQeyeV2MDTest, GroupLinesDoNotMatch) {
  EXPECT_EQ(ReadOne("group=0;level=60;threshold=50;"), (MotionReading{0, false, 0}));
}

TEST_F(IQeyeV2MDTest, WithoutMotionTheLastLinesLevelIsReported) {
  EXPECT_EQ(ReadOne("window=1;level=30;threshold=50\r\nwindow=2;level=5;threshold=50\r\n"),
            (MotionReading{0, false, 5}));
}

TEST_F(IQeyeV2MDTest, PartOf1025BytesIsReadWhole) {
  const std::string line = "window=3;level=70;threshold=50";
  std::string body(1025 - line.size(), '\n');
  EXPECT_EQ(ReadOne(body + line), (MotionReading{0, true, 70}));
}

TEST_F(IQeyeV2MDTest, LoopReadsTheFixedPathOnTheCamerasPort) {
  cam_.Handle(kPath,
              PushHandler({Push{{"window=1;level=60;threshold=50", "window=1;level=5;threshold=50"},
                                Push::kRepeatLast,
                                std::chrono::milliseconds(5)}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  IQeyeV2MD detector(&camera_);
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

TEST_F(IQeyeV2MDTest, WithoutCameraTheLoopEndsAtOnceReportingNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  IQeyeV2MD detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

}  // namespace
