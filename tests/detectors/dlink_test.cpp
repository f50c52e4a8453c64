#include "detectors/dlink.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;
using evtest::Respond;
using evtest::Text;

const char kNotify[] = "/config/notify.cgi";

// The rest of a notify.cgi answer: enough lines that an input scan never runs off its end.
const char kTail[] =
    "output1=off\r\nrecording=off\r\nsnapshot=off\r\naudio=off\r\nvideoloss=off\r\n"
    "schedule=on\r\nname=DCS\r\nmode=day\r\n";

std::string InputBody(bool in1, bool in2, bool in3) {
  auto on = [](bool b) { return b ? "on" : "off"; };
  return std::string("input1=") + on(in1) + "\r\ninput2=" + on(in2) + "\r\ninput3=" + on(in3) +
         "\r\n" + kTail;
}

class DLinkTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(kNotify, Respond(200, type, body));
    DLinkMD detector(&camera_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Inputs(int inputs) {
    DLINKEID detector(&camera_, inputs);
    Reading r{7, true, 0};
    r.result = detector.DoEID(r.state);
    return r;
  }
  std::vector<std::string> Notify(size_t times) const {
    return std::vector<std::string>(times, kNotify);
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "secret")};
};

TEST_F(DLinkTest, MotionOnGivesTheCamerasOwnLevel) {
  Reading r = Motion("md1=on\r\nmdv1=37\r\n" + std::string(kTail));
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 37u);
  EXPECT_EQ(cam_.Targets(), Notify(1));
}

TEST_F(DLinkTest, MotionOffGivesLevelZero) {
  Reading r = Motion("md1=off\r\nmdv1=37\r\n" + std::string(kTail));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(DLinkTest, MotionFlagIgnoresCaseAndIsAPrefix) {
  Reading r = Motion("MD1=ON\r\nmdv1=12\r\n");
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 12u);
  EXPECT_TRUE(Motion("md1=only\r\nmdv1=5\r\n").state);
}

TEST_F(DLinkTest, OnlyTheFirstLineIsTheMotionFlag) {
  Reading r = Motion("name=DCS\r\nmd1=on\r\nmdv1=37\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(DLinkTest, UnparsableLevelLineLeavesLevelZero) {
  Reading r = Motion("md1=on\r\nMDV1=37\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(DLinkTest, MotionAnswerEndingAfterTheFlagFails) {
  Reading r = Motion("md1=on");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_EQ(Motion("").result, -1);
}

TEST_F(DLinkTest, AnyMediaTypeButAMissingOneFails) {
  EXPECT_TRUE(Motion("md1=on\r\nmdv1=3\r\n", "application/x-anything").state);
  Reading r = Motion("md1=on\r\nmdv1=3\r\n", "");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
}

TEST_F(DLinkTest, HttpErrorAndNullCameraFailTheMotionPoll) {
  cam_.Answer(kNotify, Respond(500, "text/plain", "md1=on\r\nmdv1=37\r\n"));
  DLinkMD detector(&camera_);
  bool state = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  DLinkMD none(nullptr);
  EXPECT_EQ(none.DoMD(state, level), -1);
}

TEST_F(DLinkTest, ThreeInputsWithOnlyInputThreeOnMakeThreeRequests) {
  cam_.Answer(kNotify, Text(InputBody(false, false, true)));
  Reading r = Inputs(3);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), Notify(3));
}

TEST_F(DLinkTest, FirstActiveInputEndsTheCycle) {
  cam_.Answer(kNotify, Text(InputBody(false, true, true)));
  Reading r = Inputs(3);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), Notify(2));
}

TEST_F(DLinkTest, FailedSecondRequestFailsTheCycleEvenWithInputThreeOn) {
  const std::string body = InputBody(false, false, true);
  cam_.AnswerSequence(kNotify, {Text(body), Respond(500, "text/plain", body), Text(body)});
  Reading r = Inputs(3);
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), Notify(2));
}

TEST_F(DLinkTest, InputTextIsComparedOverItsWholeLength) {
  // The text for input 1 is "input1=on": a line that begins with it matches whatever
  // follows, while input12=on is another input's line.
  cam_.Answer(kNotify, Text("input1=online\r\n" + std::string(kTail)));
  Reading r = Inputs(1);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  cam_.Answer(kNotify, Text("input12=on\r\n" + std::string(kTail) + "x=1\r\n"));
  r = Inputs(1);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), Notify(2));
}

TEST_F(DLinkTest, InputLineIgnoresCase) {
  cam_.Answer(kNotify, Text("INPUT1=ON\r\n" + std::string(kTail)));
  EXPECT_TRUE(Inputs(1).state);
}

TEST_F(DLinkTest, NoInputsMeansNoRequest) {
  for (int inputs : {0, -2}) {
    Reading r = Inputs(inputs);
    EXPECT_EQ(r.result, 0);
    EXPECT_FALSE(r.state);
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(DLinkTest, InputLineBeyondTheTenthIsNotSeen) {
  std::string ten;
  for (int i = 0; i < 10; ++i) ten += "x" + std::to_string(i) + "=off\r\n";
  cam_.Answer(kNotify, Text(ten + "input1=on\r\n"));
  Reading r = Inputs(1);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(DLinkTest, InputAnswerEndingBeforeTenLinesWithoutTheInputFails) {
  cam_.Answer(kNotify, Text("input1=off\r\ninput2=off\r\n"));
  Reading r = Inputs(1);
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  cam_.Answer(kNotify, Text("input1=on\r\ninput2=off\r\n"));
  r = Inputs(1);
  EXPECT_EQ(r.result, 0) << "a match before the end is enough";
  EXPECT_TRUE(r.state);
}

TEST_F(DLinkTest, NullCameraFailsTheInputPollAndItsLoopReportsNothing) {
  DLINKEID detector(nullptr, 2);
  bool state = true;
  EXPECT_EQ(detector.DoEID(state), -1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST_F(DLinkTest, MotionLoopRunsAtTheBoundIntervalAndReportsTheLevel) {
  cam_.Answer(kNotify, Text("md1=on\r\nmdv1=37\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  DLinkMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  // A one-second period would need far longer than this deadline for six reports.
  ASSERT_TRUE(recorder.WaitForCount(6, std::chrono::seconds(4)));
  cam_.Answer(kNotify, Text("md1=off\r\nmdv1=2\r\n"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  cam_.Answer(kNotify, Respond(404, "text/plain", ""));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{true, 37}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST_F(DLinkTest, MotionLoopWithNullCameraReportsFailedReadings) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  DLinkMD detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(DLinkTest, InputLoopReportsValidityAndFailure) {
  cam_.Answer(kNotify, Text(InputBody(false, true, false)));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  DLINKEID detector(&camera_, 2);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(kNotify, Respond(500, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().front(), (Report{true, 1}));
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kNotify);
}

TEST_F(DLinkTest, CredentialsAnswerTheCamerasChallenge) {
  cam_.RequireAuth(evsim::AuthScheme::kBasic, "admin", "secret");
  Reading r = Motion("md1=on\r\nmdv1=40\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_EQ(r.level, 40u);
}

}  // namespace
