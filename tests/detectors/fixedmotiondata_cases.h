// The cases that every detector of motion data pushed at a fixed path on the camera's own
// port (AirliveV1MD, IQeyeV2MD) must pass, written once as a typed test pattern. Each maker's
// test file instantiates it with a traits struct:
//
//   struct IqeyeStream {
//     using Detector = IQeyeV2MD;
//     static constexpr const char* kPath = "/now.motiondata";
//     static std::string Line(int window, int level, int threshold);  // the maker's line
//   };
//   INSTANTIATE_TYPED_TEST_SUITE_P(Iqeye, FixedMotionDataTest, IqeyeStream);
//
// Every case runs the detector against a fake camera over loopback and checks the reading,
// the reports and the requests the camera saw.

#ifndef EVWATCH_TESTS_DETECTORS_FIXEDMOTIONDATA_CASES_H_
#define EVWATCH_TESTS_DETECTORS_FIXEDMOTIONDATA_CASES_H_

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace evtest {

template <class Traits>
class FixedMotionDataTest : public ::testing::Test {
 protected:
  using Detector = typename Traits::Detector;

  MotionReading ReadOne(const std::string& body) {
    Detector detector(&camera_);
    return ReadMotionParts(cam_, Traits::kPath, detector, {body})[0];
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TYPED_TEST_SUITE_P(FixedMotionDataTest);

TYPED_TEST_P(FixedMotionDataTest, LevelAboveThresholdIsMotionWithThatLevel) {
  using T = TypeParam;
  EXPECT_EQ(this->ReadOne(T::Line(1, 11, 10)), (MotionReading{0, true, 11}));
  EXPECT_EQ(this->ReadOne(T::Line(1, 10, 10)), (MotionReading{0, false, 10}));
  // Compared unsigned: a level of -1 beats any threshold.
  EXPECT_EQ(this->ReadOne(T::Line(2, -1, 10) + "\r\n"), (MotionReading{0, true, 4294967295u}));
}

TYPED_TEST_P(FixedMotionDataTest, WithoutMotionTheLastLinesLevelIsReported) {
  using T = TypeParam;
  EXPECT_EQ(this->ReadOne(T::Line(1, 30, 50) + "\r\n" + T::Line(2, 5, 50) + "\r\n"),
            (MotionReading{0, false, 5}));
}

TYPED_TEST_P(FixedMotionDataTest, LoopReadsTheFixedPathOnTheCamerasPort) {
  using T = TypeParam;
  this->cam_.Handle(T::kPath, PushHandler({Push{{T::Line(1, 60, 50), T::Line(1, 5, 50)},
                                                Push::kRepeatLast,
                                                std::chrono::milliseconds(5)}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  typename T::Detector detector(&this->camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 60}));
  EXPECT_EQ(reports[1], (Report{false, 5}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(this->cam_.Targets(), (std::vector<std::string>{T::kPath}));
}

TYPED_TEST_P(FixedMotionDataTest, WithoutCameraTheLoopEndsAtOnceReportingNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  typename TypeParam::Detector detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

REGISTER_TYPED_TEST_SUITE_P(FixedMotionDataTest, LevelAboveThresholdIsMotionWithThatLevel,
                            WithoutMotionTheLastLinesLevelIsReported, LoopReadsTheFixedPathOnTheCamerasPort,
                            WithoutCameraTheLoopEndsAtOnceReportingNothing);

}  // namespace evtest

#endif  // EVWATCH_TESTS_DETECTORS_FIXEDMOTIONDATA_CASES_H_
