#include "detectors/brickcom.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;
using evtest::Respond;
using evtest::Text;

const char kGpio[] = "/cgi-bin/gpio.cgi?action=get";

class BrickcomTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
  };
  Reading Input(const std::string& body, int inputs) {
    cam_.Answer(kGpio, Text(body));
    cam_.ClearLog();
    BrickcomEID detector(&camera_, &api_, inputs);
    Reading r{7, true};
    r.result = detector.DoEID(r.state);
    return r;
  }
  std::vector<std::string> Asked(int n) { return std::vector<std::string>(static_cast<size_t>(n), kGpio); }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "admin")};
  // The API names another port and path: the detector does not ask it.
  CameraAPI api_{CameraAPIRecord{"brickcom", StreamLocation{"/elsewhere", 1}, {}, {{0, 0, 0, 0}}}};
};

TEST_F(BrickcomTest, SecondInputAtZeroIsActiveAfterTwoRequests) {
  Reading r = Input("di1.status=1\ndi2.status=0\ndo1.status=0\n", 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), Asked(2));
}

TEST_F(BrickcomTest, FirstInputAtZeroIsActiveAfterOneRequest) {
  Reading r = Input("di1.status=0\ndi2.status=1\n", 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), Asked(1));
}

TEST_F(BrickcomTest, EveryOtherValueIsIdle) {
  Reading r = Input("di1.status=1\ndi2.status=00\ndi3.status=\ndi4.status=active\n", 4);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), Asked(4));
  r = Input("di1.status = 0 \r\n", 1);
  EXPECT_TRUE(r.state) << "blanks and a CR around the value do not count";
}

TEST_F(BrickcomTest, InputsAboveTheCountAreNotAsked) {
  Reading r = Input("di1.status=1\ndi2.status=0\n", 1);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), Asked(1));
}

TEST_F(BrickcomTest, AMissingInputFailsTheWholeReading) {
  // Input 1 was read (idle) and input 2 is missing: the reading fails all the same.
  Reading r = Input("di1.status=1\ndi3.status=0\n", 3);
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), Asked(2));
}

TEST_F(BrickcomTest, AFailedRequestFailsTheWholeReading) {
  cam_.AnswerSequence(kGpio, {Text("di1.status=1\n"), Respond(503, "text/plain", "di2.status=0\n")});
  BrickcomEID detector(&camera_, &api_, 2);
  bool active = true;
  EXPECT_EQ(detector.DoEID(active), -1);
  EXPECT_FALSE(active);
  EXPECT_EQ(cam_.Targets(), Asked(2));
}

TEST_F(BrickcomTest, KeyBeyondTheFirst8192BytesIsNotFound) {
  const std::string filler(8191, ' ');
  EXPECT_EQ(Input(filler + "\ndi1.status=0\n", 1).result, -1);
  Reading r = Input("di1.status=0\n" + filler, 1);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
}

TEST_F(BrickcomTest, ZeroOrNegativeCountReadsIdleWithoutARequest) {
  for (int inputs : {0, -1, -100}) {
    Reading r = Input("di1.status=0\n", inputs);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.state) << inputs;
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(BrickcomTest, ZeroCountLoopReportsIdleBackToBackWithoutRequests) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  BrickcomEID detector(&camera_, &api_, 0);
  // An hour's interval: a loop paced by it could not make a second report before the deadline.
  ASSERT_EQ(detector.Init(&buffer, 3600 * 1000), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(1000));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) ASSERT_EQ(reports[i], (Report{false, 1})) << i;
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(BrickcomTest, LoopAsksBackToBackAndReportsEachCycle) {
  cam_.AnswerSequence(kGpio, {Text("di1.status=1\n"), Text("di2.status=0\n"), Respond(500, "text/plain", ""),
                              Text("di1.status=0\n")});
  EventBuf buffer;
  EventRecorder recorder(buffer);
  BrickcomEID detector(&camera_, &api_, 2);
  ASSERT_EQ(detector.Init(&buffer, 3600 * 1000), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(4));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  // Cycle 1: input 1 idle, input 2 active (two requests). Cycle 2: a failure (one request).
  // Then input 1 active in every cycle (one request each).
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{true, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // Two requests in the first cycle, one in every other: as many as the reports with the final one.
  EXPECT_EQ(static_cast<size_t>(cam_.Count(kGpio)), reports.size());
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kGpio);
}

TEST_F(BrickcomTest, LoopWithoutCameraOrApiReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  BrickcomEID no_api(&camera_, nullptr, 1);
  ASSERT_EQ(no_api.Init(&buffer, 10), 0);
  ASSERT_EQ(no_api.Start(), 0);
  ASSERT_EQ(no_api.Stop(), 0);
  BrickcomEID no_camera(nullptr, &api_, 1);
  ASSERT_EQ(no_camera.Init(&buffer, 10), 0);
  ASSERT_EQ(no_camera.Start(), 0);
  ASSERT_EQ(no_camera.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
  EXPECT_TRUE(cam_.Targets().empty());
  bool active = true;
  EXPECT_EQ(no_camera.DoEID(active), -1);
  EXPECT_FALSE(active);
}

}  // namespace
