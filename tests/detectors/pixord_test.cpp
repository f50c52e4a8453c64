// PIXORDMD against a fake camera that pushes motion data at the API's stream, with the
// threshold taken from the API; PIXORDEID against the camera's parameter CGI.

#include "detectors/pixord.h"

#include <gtest/gtest.h>

#include <chrono>
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
using evtest::ReadMotionParts;
using evtest::Report;

const char kPath[] = "/pixord/motiondata.cgi";
const char kInputPath[] = "/cgi-bin/admin/sm.cgi?actions=listgroup&Input";

std::string Line(int level, int sensitivity = 50) {
  return "group=0;level=" + std::to_string(level) + ";sensitivity=" + std::to_string(sensitivity) +
         ";\r\n";
}

// A part of 1025 bytes ending in `line`.
std::string Long(const std::string& line) { return std::string(1025 - line.size(), '\n') + line; }

CameraAPIRecord StreamAt(int port, int threshold) {
  CameraAPIRecord record;
  record.stream = StreamLocation{kPath, port};
  record.md_params = {{7, threshold, 9, 11}};
  return record;
}

class PixordTest : public ::testing::Test {
 protected:
  std::vector<Report> RunMD(CameraAPI& api, std::vector<std::string> parts, size_t count) {
    cam_.Handle(kPath, PushHandler({Push{std::move(parts), Push::kRepeatLast,
                                         std::chrono::milliseconds(5)}}));
    EventBuf buffer;
    EventRecorder recorder(buffer);
    PIXORDMD detector(&camera_, &api);
    EXPECT_EQ(detector.Init(&buffer, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitForCount(count));
    EXPECT_EQ(detector.Stop(), 0);
    threshold_seen_ = detector.Threshold();
    return recorder.Reports();
  }
  // DoEID against a camera whose input CGI answers `answer`; the requests it made.
  std::pair<int, bool> AskInputs(int inputs, const std::string& answer) {
    cam_.ClearLog();
    cam_.Answer(kInputPath, evtest::Text(answer));
    PIXORDEID detector(&camera_, inputs);
    bool active = true;
    int result = detector.DoEID(active);
    return {result, active};
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  int threshold_seen_ = -1;
};

TEST_F(PixordTest, ThresholdComesFromTheApiAndSensitivityIsIgnored) {
  CameraAPI api(StreamAt(cam_.Port(), 30));
  std::vector<Report> reports = RunMD(api, {Line(30, 0), Line(31, 99), Line(31, 0)}, 3);
  EXPECT_EQ(reports[0], (Report{false, 30}));
  EXPECT_EQ(reports[1], (Report{true, 31}));
  EXPECT_EQ(reports[2], (Report{true, 31}));
  EXPECT_EQ(threshold_seen_, 30);
}

TEST_F(PixordTest, NegativeLevelNeverExceedsAThresholdOfZero) {
  CameraAPI api(StreamAt(cam_.Port(), 0));
  PIXORDMD detector(&camera_, &api);
  EXPECT_EQ(detector.Threshold(), 0);
  EXPECT_EQ(ReadMotionParts(cam_, kPath, detector, {Line(-1), Line(1), Line(0)}),
            (std::vector<MotionReading>{{0, false, 4294967295u}, {0, true, 1}, {0, false, 0}}));
}

TEST_F(PixordTest, NegativeThresholdFromTheApiIsComparedSigned) {
  CameraAPI api(StreamAt(cam_.Port(), -5));
  std::vector<Report> reports = RunMD(api, {Line(-5), Line(-4)}, 2);
  EXPECT_EQ(reports[0], (Report{false, -5}));
  EXPECT_EQ(reports[1], (Report{true, -4}));
}

TEST_F(PixordTest, LinesAreScannedAsTheMotionDataFamilysAre) {
  CameraAPI api(StreamAt(cam_.Port(), 0));
  PIXORDMD detector(&camera_, &api);
  EXPECT_EQ(ReadMotionParts(cam_, kPath, detector,
                            {Line(0) + Line(7), Line(0) + "nothing\r\n",
                             "group=0;level=0;threshold=50;\r\ngroup=1;level=3;threshold=50;\r\n",
                             "group\r\n" + Line(9), Long("group=2;level=8;sensitivity=1;")}),
            (std::vector<MotionReading>{{0, true, 7}, {0, false, 0}, {0, true, 3},
                                        {0, false, 0}, {0, true, 8}}));
  unsigned int level = 77;
  std::string body = Line(9);
  EXPECT_EQ(detector.IsMotionDetected(&body[0], -1, level), 0);
  EXPECT_EQ(level, 77u);
}

TEST_F(PixordTest, NoFetcherIsAFailedReading) {
  CameraAPI api(StreamAt(cam_.Port(), 0));
  PIXORDMD detector(&camera_, &api);
  MotionReading r{0, true, 9};
  r.result = detector.DoMD(nullptr, r.motion, r.level);
  EXPECT_EQ(r, (MotionReading{-1, false, 0}));
}

TEST_F(PixordTest, WithoutCameraApiOrStreamTheMotionLoopEndsAtOnce) {
  CameraAPI api(StreamAt(cam_.Port(), 0));
  CameraAPI no_stream{CameraAPIRecord{}};
  PIXORDMD a(nullptr, &api), b(&camera_, nullptr), c(&camera_, &no_stream);
  for (PIXORDMD* detector : {&a, &b, &c}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_EQ(cam_.Count(kPath), 0);
}

TEST_F(PixordTest, MotionCameraThatStopsPushingAndComesBackIsFollowedAgain) {
  CameraAPI api(StreamAt(cam_.Port(), 20));
  cam_.Handle(kPath, OutageHandler({Line(60)}, Line(70)));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  PIXORDMD detector(&camera_, &api);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 70}, std::chrono::seconds(20)));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_TRUE(FollowedAcrossOutage(recorder.Reports(), Report{true, 60}, Report{true, 70}));
}

TEST_F(PixordTest, InputsAreAskedFromZeroWithTheirKeys) {
  // Count 2 asks Input.I00.Status and then Input.I01.Status: the second answers.
  EXPECT_EQ(AskInputs(2, "Input.I01.Status=high\r\n"), std::make_pair(0, true));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kInputPath, kInputPath}));
  EXPECT_EQ(AskInputs(2, "Input.I02.Status=high\r\n"), std::make_pair(0, false));
  EXPECT_EQ(cam_.Count(kInputPath), 2);
  EXPECT_EQ(AskInputs(3, "Input.I02.Status=HIGH\r\n"), std::make_pair(0, true));
  EXPECT_EQ(cam_.Count(kInputPath), 3);
  EXPECT_EQ(AskInputs(2, "Input.I01.Status=low\r\n"), std::make_pair(0, false));
}

TEST_F(PixordTest, TheZeroBeforeTheInputNumberIsAlwaysThere) {
  EXPECT_EQ(AskInputs(13, "Input.I012.Status=high\r\n"), std::make_pair(0, true));
  EXPECT_EQ(cam_.Count(kInputPath), 13);
  EXPECT_EQ(AskInputs(13, "Input.I12.Status=high\r\n"), std::make_pair(0, false));
}

TEST_F(PixordTest, FirstActiveInputEndsTheQuestions) {
  EXPECT_EQ(AskInputs(4, "Input.I00.Status=high\r\nInput.I01.Status=high\r\n"),
            std::make_pair(0, true));
  EXPECT_EQ(cam_.Count(kInputPath), 1);
}

TEST_F(PixordTest, CountBelowOneAsksNothingAndNoCameraFails) {
  EXPECT_EQ(AskInputs(0, "Input.I00.Status=high\r\n"), std::make_pair(0, false));
  EXPECT_EQ(AskInputs(-4, "Input.I00.Status=high\r\n"), std::make_pair(0, false));
  EXPECT_EQ(cam_.Count(kInputPath), 0);
  PIXORDEID detector(nullptr, 1);
  bool active = true;
  EXPECT_EQ(detector.DoEID(active), -1);
}

TEST_F(PixordTest, FailedRequestIsAnIdleValidReading) {
  cam_.Answer(kInputPath, evtest::Respond(500, "text/plain", "Input.I00.Status=high\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  PIXORDEID detector(&camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(1));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{false, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST_F(PixordTest, InputLoopFollowsTheCameraAcrossAnOutage) {
  cam_.AnswerSequence(kInputPath, {evtest::Text("Input.I00.Status=high\r\n"),
                                   evtest::Respond(503, "text/plain", ""),
                                   evtest::Text("Input.I00.Status=high\r\n")});
  EventBuf buffer;
  EventRecorder recorder(buffer);
  PIXORDEID detector(&camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3, std::chrono::seconds(20)));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  // A polled input detector keeps its reading valid while the camera fails: idle, then
  // active again once the camera answers.
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 1}));
  EXPECT_EQ(reports[2], (Report{true, 1}));
}

}  // namespace
