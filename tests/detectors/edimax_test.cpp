// EDIMAXMD against a fake camera that pushes parts whose header lines carry the motion
// event, at the stream path the camera API names on the camera's own port.

#include "detectors/edimax.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::FollowedAcrossOutage;
using evtest::MotionReading;
using evtest::OutageHandler;
using evtest::Push;
using evtest::PushHandler;
using evtest::RawPart;
using evtest::ReadRawMotionParts;
using evtest::Report;

const char kPath[] = "/mjpg/event.cgi";

CameraAPIRecord StreamAt(int port) {
  CameraAPIRecord record;
  record.stream = StreamLocation{kPath, port};
  return record;
}

class EdimaxTest : public ::testing::Test {
 protected:
  MotionReading Read(const std::string& raw_part) {
    EDIMAXMD detector(&camera_, &api_);
    return ReadRawMotionParts(cam_, kPath, detector, {raw_part})[0];
  }
  std::vector<Report> Run(DetectorBase& detector,
                          const std::function<bool(const std::vector<Report>&)>& pred) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    EXPECT_EQ(detector.Init(&buffer, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitFor(pred, std::chrono::seconds(20)));
    EXPECT_EQ(detector.Stop(), 0);
    return recorder.Reports();
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  CameraAPI api_{StreamAt(cam_.Port())};
};

TEST_F(EdimaxTest, HeaderLinesBeforeTheBodyAreJudged) {
  EXPECT_EQ(Read(RawPart("jpeg", {"motion-event: 1"})), (MotionReading{0, true, 100}));
  EXPECT_EQ(Read(RawPart("jpeg", {"motion-event: 0"})), (MotionReading{0, false, 0}));
  EXPECT_EQ(Read(RawPart("jpeg", {"motion-event: 2"})), (MotionReading{0, false, 0}));
  EXPECT_EQ(Read(RawPart("jpeg", {"X-Other: 5", "motion-event:1"})), (MotionReading{0, true, 100}));
  EXPECT_EQ(Read(RawPart("jpeg")), (MotionReading{0, false, 0}));
  EXPECT_EQ(Read(RawPart("motion-event: 1\r\n")), (MotionReading{0, false, 0}))
      << "the body is not judged";
  EXPECT_EQ(Read(RawPart(std::string(2000, 'j'), {"motion-event: 1"})),
            (MotionReading{0, true, 100}));
}

TEST_F(EdimaxTest, HeaderLineEndingBeforeItsNumberEndsTheScan) {
  EXPECT_EQ(Read(RawPart("jpeg", {"m", "motion-event: 1"})), (MotionReading{0, false, 0}));
}

TEST_F(EdimaxTest, ConnectsToTheCamerasPortNotTheApis) {
  cam_.Handle(kPath, PushHandler({Push{{RawPart("jpeg", {"motion-event: 1"})}, Push::kRepeatLast,
                                       std::chrono::milliseconds(5), "", 200, true}}));
  CameraAPI elsewhere(StreamAt(1));
  EDIMAXMD detector(&camera_, &elsewhere);
  std::vector<Report> reports =
      Run(detector, [](const std::vector<Report>& r) { return r.size() >= 2; });
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

TEST_F(EdimaxTest, NoFetcherIsAFailedReading) {
  EDIMAXMD detector(&camera_, &api_);
  MotionReading r{0, true, 9};
  r.result = detector.DoMD(nullptr, r.motion, r.level);
  EXPECT_EQ(r, (MotionReading{-1, false, 0}));
}

TEST_F(EdimaxTest, WithoutCameraApiOrStreamTheLoopEndsAtOnceReportingNothing) {
  CameraAPI no_stream{CameraAPIRecord{}};
  EDIMAXMD a(nullptr, &api_), b(&camera_, nullptr), c(&camera_, &no_stream);
  for (EDIMAXMD* detector : {&a, &b, &c}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_EQ(cam_.Count(kPath), 0);
}

TEST_F(EdimaxTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  const std::string part = RawPart("jpeg", {"motion-event: 1"});
  cam_.Handle(kPath, OutageHandler({part}, part, true));
  EDIMAXMD detector(&camera_, &api_);
  std::vector<Report> reports = Run(detector, [](const std::vector<Report>& r) {
    return r.size() > 2 && r.back() == Report{true, 100};
  });
  EXPECT_TRUE(FollowedAcrossOutage(reports, Report{true, 100}, Report{true, 100}));
}

}  // namespace
