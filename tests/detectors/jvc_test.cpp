#include "detectors/jvc.h"

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
using Targets = std::vector<std::string>;

std::string Key(int pin) { return "peripheral.input_pin.pin(" + std::to_string(pin) + ").status"; }
std::string Target(int pin) { return "/api/param?" + Key(pin); }

class JVCEIDTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool active;
  };
  Reading Read(int inputs, bool preset = true) {
    JVCEID detector(&camera_, inputs);
    Reading r{7, preset};
    r.result = detector.DoEID(r.active);
    return r;
  }
  Reading ReadBody(const std::string& body) {
    cam_.Answer(Target(1), Text(body));
    return Read(1);
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "jvc")};
};

TEST_F(JVCEIDTest, AsksEachPinAtItsParameterPathWithThePathAsKey) {
  cam_.Answer(Target(1), Text(Key(1) + "=break&200\r\n"));
  cam_.Answer(Target(2), Text(Key(2) + "=make&200\r\n"));
  Reading r = Read(2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(cam_.Targets(),
            (Targets{"/api/param?peripheral.input_pin.pin(1).status",
                     "/api/param?peripheral.input_pin.pin(2).status"}));
}

TEST_F(JVCEIDTest, ActivePinOneEndsThePass) {
  cam_.Answer(Target(1), Text(Key(1) + "=make&200\r\n"));
  cam_.Answer(Target(2), Text(Key(2) + "=make&200\r\n"));
  EXPECT_TRUE(Read(2).active);
  EXPECT_EQ(cam_.Targets(), (Targets{Target(1)}));
}

TEST_F(JVCEIDTest, AllPinsInactiveAreAllAsked) {
  for (int pin = 1; pin <= 3; ++pin) cam_.Answer(Target(pin), Text(Key(pin) + "=break&200\r\n"));
  Reading r = Read(3);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{Target(1), Target(2), Target(3)}));
}

TEST_F(JVCEIDTest, TheWholeExpectedValueMustBeginTheAnswer) {
  EXPECT_TRUE(ReadBody(Key(1) + "=make&200\r\n").active);
  EXPECT_TRUE(ReadBody(Key(1) + "=MAKE&200 ok\r\n").active);
  EXPECT_FALSE(ReadBody(Key(1) + "=make\r\n").active);
  EXPECT_FALSE(ReadBody(Key(1) + "=make&500\r\n").active);
  // Another pin's line is not this pin's.
  EXPECT_FALSE(ReadBody(Key(2) + "=make&200\r\n").active);
}

TEST_F(JVCEIDTest, FailedRequestCountsAsInactive) {
  cam_.Answer(Target(1), Respond(404, "text/plain", Key(1) + "=make&200\r\n"));
  cam_.Answer(Target(2), Text(Key(2) + "=make&200\r\n"));
  Reading r = Read(2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{Target(1), Target(2)}));
}

TEST_F(JVCEIDTest, InputCountBelowOneAsksNothingAndReadsInactive) {
  for (int inputs : {0, -1, -3}) {
    Reading r = Read(inputs, true);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.active) << inputs;
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(JVCEIDTest, CredentialsAnswerTheCamerasChallenge) {
  cam_.RequireAuth(evsim::AuthScheme::kBasic, "admin", "jvc");
  EXPECT_TRUE(ReadBody(Key(1) + "=make&200\r\n").active);
}

TEST_F(JVCEIDTest, NullCameraFailsTheReadingAndTheLoopReportsNothing) {
  JVCEID detector(nullptr, 2);
  bool active = true;
  EXPECT_EQ(detector.DoEID(active), -1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST_F(JVCEIDTest, LoopReportsStateWithValidityAndFinalFalse) {
  cam_.Answer(Target(1), Text(Key(1) + "=make&200\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  JVCEID detector(&camera_, 2);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(Target(1), Text(Key(1) + "=break&200\r\n"));
  cam_.Answer(Target(2), Respond(500, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // While pin 1 was active pin 2 was never asked; after, both were asked per pass.
  const Targets seen = cam_.Targets();
  ASSERT_FALSE(seen.empty());
  EXPECT_EQ(seen.front(), Target(1));
  EXPECT_EQ(seen.back(), Target(2));
}

}  // namespace
