// PanaMD and PanaEID against a fake camera that pushes status lines at the stream the
// camera API names.

#include "detectors/panasonic.h"

#include <gtest/gtest.h>

#include <atomic>
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
using evtest::InputReading;
using evtest::MotionReading;
using evtest::OutageHandler;
using evtest::Push;
using evtest::PushHandler;
using evtest::ReadInputParts;
using evtest::ReadMotionParts;
using evtest::Report;

const char kPath[] = "/nphStatusStream?channel=1";

CameraAPIRecord StreamAt(int port) {
  CameraAPIRecord record;
  record.stream = StreamLocation{kPath, port};
  return record;
}

// A camera API that counts how often it is asked for its stream.
class CountingApi : public CameraAPI {
 public:
  explicit CountingApi(CameraAPIRecord record) : CameraAPI(std::move(record)) {}
  int GetStreamPath(std::string& path, int& port) override {
    ++asked;
    return CameraAPI::GetStreamPath(path, port);
  }
  std::atomic<int> asked{0};
};

class PanasonicTest : public ::testing::Test {
 protected:
  MotionReading Motion(const std::string& body, const std::string& channel = "1") {
    CameraRecord record = cam_.Record();
    record.channel = channel;
    Camera camera(record);
    PanaMD detector(&camera, &api_);
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }
  InputReading Input(const std::string& body, int inputs) {
    PanaEID detector(&camera_, &api_, inputs);
    return ReadInputParts(cam_, kPath, detector, {body})[0];
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

TEST_F(PanasonicTest, MotionLineDependsOnTheChannel) {
  EXPECT_EQ(Motion("motiondetect T\r\n", "1"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("motiondetect ch2T\r\n", "2"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("motiondetect T\r\n", "2"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("motiondetect ch2T\r\n", "1"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("motiondetect ch12T\r\n", "12"), (MotionReading{0, true, 100}));
}

TEST_F(PanasonicTest, OnlyFalseStatesAreNoMotion) {
  EXPECT_EQ(Motion("motiondetect F\r\nmotiondetect F\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("motiondetect F\r\nmotiondetect T\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("alarm T\r\n"), (MotionReading{0, false, 0}));
}

TEST_F(PanasonicTest, LineEndingBeforeTheLetterEndsTheScan) {
  EXPECT_EQ(Motion("motiondetect\r\nmotiondetect T\r\n"), (MotionReading{0, false, 0}));
}

TEST_F(PanasonicTest, ChannelTextIsALiteralInTheFormat) {
  EXPECT_EQ(Motion("motiondetect ch%dT\r\n", "%d"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("motiondetect ch5T\r\n", "%d"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("motiondetect ch%sT\r\n", "%s%s%s%n"), (MotionReading{0, false, 0}));
}

TEST_F(PanasonicTest, WatchedInputWithLetterLIsActive) {
  EXPECT_EQ(Input("terminal2 I L\r\n", 3), (InputReading{0, true}));
  EXPECT_EQ(Input("terminal1 I H\r\n", 3), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal1 I H\r\nterminal3 I L\r\n", 3), (InputReading{0, true}));
  EXPECT_EQ(Input("terminal3 I  L\r\n", 3), (InputReading{0, true})) << "blanks before the letter";
}

TEST_F(PanasonicTest, InputsBeyondTheCountAreIgnored) {
  EXPECT_EQ(Input("terminal4 I L\r\n", 3), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal1 I L\r\n", 0), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal1 I L\r\n", -2), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal12 I L\r\n", 11), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal12 I L\r\n", 12), (InputReading{0, true}));
  EXPECT_EQ(Input("terminal01 I L\r\n", 3), (InputReading{0, false})) << "no input is written 01";
  EXPECT_EQ(Input("terminal99999999999 I L\r\n", 2147483647), (InputReading{0, false}));
  EXPECT_EQ(Input("terminal2147483647 I L\r\n", 2147483647), (InputReading{0, true}));
}

TEST_F(PanasonicTest, PartLongerThan1024BytesIsJudgedTheSame) {
  const std::string motion = "motiondetect T";
  EXPECT_EQ(Motion(std::string(1500 - motion.size(), '\n') + motion), (MotionReading{0, true, 100}));
  const std::string input = "terminal2 I L";
  EXPECT_EQ(Input(std::string(1500 - input.size(), '\n') + input, 3), (InputReading{0, true}));
}

TEST_F(PanasonicTest, NoFetcherIsAFailedReading) {
  PanaMD md(&camera_, &api_);
  MotionReading m{0, true, 9};
  m.result = md.DoMD(nullptr, m.motion, m.level);
  EXPECT_EQ(m, (MotionReading{-1, false, 0}));
  PanaEID eid(&camera_, &api_, 1);
  InputReading i{0, true};
  i.result = eid.DoEID(nullptr, i.active);
  EXPECT_EQ(i, (InputReading{-1, false}));
}

TEST_F(PanasonicTest, MotionAsksTheApiForItsStreamAgainForEveryPart) {
  CountingApi api(StreamAt(cam_.Port()));
  PanaMD detector(&camera_, &api);
  EXPECT_EQ(ReadMotionParts(cam_, kPath, detector, {"motiondetect T", "motiondetect F", "x"}),
            (std::vector<MotionReading>{{0, true, 100}, {0, false, 0}, {0, false, 0}}));
  EXPECT_EQ(api.asked.load(), 3);
}

TEST_F(PanasonicTest, LoopsReportEachPartOnTheApisStream) {
  cam_.Handle(kPath, PushHandler({Push{{"motiondetect T\r\nterminal1 I L\r\n",
                                        "motiondetect F\r\nterminal1 I H\r\n"},
                                       Push::kRepeatLast, std::chrono::milliseconds(5)}}));
  CameraRecord record = cam_.Record();
  record.port = 1;  // the API's port is the one used
  Camera camera(record);
  CountingApi api(StreamAt(cam_.Port()));
  PanaMD md(&camera, &api);
  std::vector<Report> reports = Run(md, [](const std::vector<Report>& r) { return r.size() >= 3; });
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_GE(api.asked.load(), 3) << "once for the loop, once per part";
  PanaEID eid(&camera, &api, 2);
  reports = Run(eid, [](const std::vector<Report>& r) { return r.size() >= 3; });
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath, kPath}));
}

TEST_F(PanasonicTest, WithoutAStreamMotionEndsAtOnceAndInputsGoOnFailing) {
  CameraAPI no_stream{CameraAPIRecord{}};
  {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    PanaMD md(&camera_, &no_stream);
    ASSERT_EQ(md.Init(&buffer, 500), 0);
    ASSERT_EQ(md.Start(), 0);
    ASSERT_EQ(md.Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  // The input detector goes on with an empty path on port 80 of the camera's host, where
  // nothing answers this test: it reports failed readings.
  PanaEID eid(&camera_, &no_stream, 1);
  std::vector<Report> reports =
      Run(eid, [](const std::vector<Report>& r) { return r.size() >= 2; });
  for (const Report& r : reports) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_EQ(cam_.Requests().size(), 0u);
}

TEST_F(PanasonicTest, WithoutCameraOrApiTheLoopsEndAtOnceReportingNothing) {
  PanaMD a(nullptr, &api_), b(&camera_, nullptr);
  PanaEID c(nullptr, &api_, 1), d(&camera_, nullptr, 1);
  for (DetectorBase* detector : std::vector<DetectorBase*>{&a, &b, &c, &d}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_EQ(cam_.Count(kPath), 0);
}

TEST_F(PanasonicTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  const std::string on = "motiondetect T\r\nterminal1 I L\r\n";
  auto back = [](Report r) {
    return [r](const std::vector<Report>& reports) { return reports.size() > 2 && reports.back() == r; };
  };
  cam_.Handle(kPath, OutageHandler({on}, on));
  PanaMD md(&camera_, &api_);
  EXPECT_TRUE(FollowedAcrossOutage(Run(md, back(Report{true, 100})), Report{true, 100}, Report{true, 100}));
  cam_.Handle(kPath, OutageHandler({on}, on));
  PanaEID eid(&camera_, &api_, 1);
  EXPECT_TRUE(FollowedAcrossOutage(Run(eid, back(Report{true, 1})), Report{true, 1}, Report{true, 1}));
}

}  // namespace
