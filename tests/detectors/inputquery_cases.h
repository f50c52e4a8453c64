// The cases that every digital-input query detector (AXISEID, AVIPCEID, AIRLIVEV1EID,
// ZavioEID) must pass, written once as a typed test pattern. Each maker's test file
// instantiates it with a traits struct:
//
//   struct AxisInputs {
//     using Detector = AXISEID;
//     static constexpr const char* kPrefix = "/axis-cgi/io/input.cgi?checkactive=";
//     static constexpr bool kEmptyLineEndsScan = false;  // the Axis-family line check
//   };
//   INSTANTIATE_TYPED_TEST_SUITE_P(Axis, InputQueryTest, AxisInputs);
//
// Every case runs the detector against a fake camera over loopback and checks the reading,
// the reports and the requests the camera saw.

#ifndef EVWATCH_TESTS_DETECTORS_INPUTQUERY_CASES_H_
#define EVWATCH_TESTS_DETECTORS_INPUTQUERY_CASES_H_

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace evtest {

template <class Traits>
class InputQueryTest : public ::testing::Test {
 protected:
  using Detector = typename Traits::Detector;

  struct Reading {
    int result;
    bool active;
  };

  static std::string Target(int input) { return Traits::kPrefix + std::to_string(input); }
  void AnswerInput(int input, const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(Target(input), Respond(200, type, body));
  }
  Reading Check(int inputs) {
    Detector detector(&camera_, inputs);
    Reading r{7, true};
    r.result = detector.DoEID(r.active);
    return r;
  }
  // Input 1's reading when the camera answers body.
  Reading CheckBody(const std::string& body, const std::string& type = "text/plain") {
    AnswerInput(1, body, type);
    return Check(1);
  }
  static std::string Lines(int count, const std::string& line) {
    std::string body;
    for (int i = 0; i < count; ++i) body += line + "\r\n";
    return body;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("root", "secret")};
};

TYPED_TEST_SUITE_P(InputQueryTest);

TYPED_TEST_P(InputQueryTest, InputCountZeroOrNegativeSendsNoRequest) {
  for (int inputs : {0, -1, -5}) {
    auto r = this->Check(inputs);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.active) << inputs;
  }
  EXPECT_TRUE(this->cam_.Targets().empty());
}

TYPED_TEST_P(InputQueryTest, InputCountZeroReportsValidIdleEverySecond) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  typename TestFixture::Detector detector(&this->camera_, 0);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{false, 1})) << i;
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_TRUE(this->cam_.Targets().empty());
}

TYPED_TEST_P(InputQueryTest, ThreeInputsWithInputTwoActiveNeverAskInputThree) {
  this->AnswerInput(1, "input1=inactive\r\n");
  this->AnswerInput(2, "input2=active\r\n");
  this->AnswerInput(3, "input3=active\r\n");
  auto r = this->Check(3);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(this->cam_.Targets(), (std::vector<std::string>{this->Target(1), this->Target(2)}));
}

TYPED_TEST_P(InputQueryTest, IdleInputsAreAllAskedInOrder) {
  for (int n = 1; n <= 3; ++n) this->AnswerInput(n, "input" + std::to_string(n) + "=inactive\r\n");
  auto r = this->Check(3);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
  EXPECT_EQ(this->cam_.Targets(),
            (std::vector<std::string>{this->Target(1), this->Target(2), this->Target(3)}));
}

TYPED_TEST_P(InputQueryTest, KeyInput10MatchesInputOne) {
  EXPECT_TRUE(this->CheckBody("input10=active\r\n").active);
  EXPECT_EQ(this->cam_.Targets(), (std::vector<std::string>{this->Target(1)}));
}

TYPED_TEST_P(InputQueryTest, ValueIsComparedOverItsOwnLength) {
  EXPECT_TRUE(this->CheckBody("input1=actively\r\n").active);
  EXPECT_FALSE(this->CheckBody("input1=inactive\r\n").active);
}

TYPED_TEST_P(InputQueryTest, KeyAndValueIgnoreCase) {
  EXPECT_TRUE(this->CheckBody("INPUT1=ACTIVE\r\n").active);
  EXPECT_TRUE(this->CheckBody("Input1 Active\r\n").active);
}

TYPED_TEST_P(InputQueryTest, TextXmlIsAccepted) {
  EXPECT_TRUE(this->CheckBody("input1=active\r\n", "text/xml").active);
  EXPECT_TRUE(this->CheckBody("input1=active\r\n", "TEXT/HTML; charset=utf-8").active);
}

TYPED_TEST_P(InputQueryTest, OtherMediaTypeCountsAsIdleButTheReadingIsValid) {
  auto r = this->CheckBody("input1=active\r\n", "application/json");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
}

TYPED_TEST_P(InputQueryTest, FailedRequestCountsAsIdleAndTheNextInputIsAsked) {
  this->cam_.Answer(TestFixture::Target(1), Respond(500, "text/plain", "input1=active\r\n"));
  this->AnswerInput(2, "input2=active\r\n");
  auto r = this->Check(2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(this->cam_.Targets(), (std::vector<std::string>{this->Target(1), this->Target(2)}));
  r = this->Check(1);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
}

TYPED_TEST_P(InputQueryTest, MatchingLineMustBeAmongTheFirstTenLines) {
  const std::string filler = TestFixture::Lines(9, "output1=active");
  EXPECT_TRUE(this->CheckBody(filler + "input1=active\r\n").active);
  EXPECT_FALSE(this->CheckBody(filler + "output2=active\r\ninput1=active\r\n").active);
}

TYPED_TEST_P(InputQueryTest, EmptyLinesInTheBody) {
  if (TypeParam::kEmptyLineEndsScan) {
    // The shared check ends at the first empty line.
    EXPECT_FALSE(this->CheckBody("\r\ninput1=active\r\n").active);
    EXPECT_FALSE(this->CheckBody("input1=inactive\r\n\r\ninput1=active\r\n").active);
  } else {
    // Empty lines are passed over but count towards the ten.
    EXPECT_TRUE(this->CheckBody(TestFixture::Lines(9, "") + "input1=active\r\n").active);
    EXPECT_FALSE(this->CheckBody(TestFixture::Lines(10, "") + "input1=active\r\n").active);
  }
}

TYPED_TEST_P(InputQueryTest, MismatchedValueIsPassedOver) {
  EXPECT_TRUE(this->CheckBody("input1=inactive\r\ninput1=active\r\n").active);
}

TYPED_TEST_P(InputQueryTest, KeyWithoutValueOrLineWithoutTokenEndsTheScan) {
  EXPECT_FALSE(this->CheckBody("input1\r\ninput1=active\r\n").active);
  EXPECT_FALSE(this->CheckBody(" :=: \r\ninput1=active\r\n").active);
}

TYPED_TEST_P(InputQueryTest, CredentialsAnswerTheCamerasChallenge) {
  this->cam_.RequireAuth(evsim::AuthScheme::kDigest, "root", "secret");
  EXPECT_TRUE(this->CheckBody("input1=active\r\n").active);
}

TYPED_TEST_P(InputQueryTest, NullCameraFailsTheReadingAndTheLoopReportsNothing) {
  typename TestFixture::Detector detector(nullptr, 2);
  bool active = true;
  EXPECT_EQ(detector.DoEID(active), -1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TYPED_TEST_P(InputQueryTest, LoopReportsStateWithValidityAndFinalFalse) {
  this->AnswerInput(1, "input1=active\r\n");
  EventBuf buffer;
  EventRecorder recorder(buffer);
  typename TestFixture::Detector detector(&this->camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  this->cam_.Answer(TestFixture::Target(1), Respond(404, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{true, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // Only the stop reports (false, 0): an unreachable input is a valid idle reading.
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i].value, 1) << i;
  for (const std::string& target : this->cam_.Targets()) EXPECT_EQ(target, this->Target(1));
}

REGISTER_TYPED_TEST_SUITE_P(InputQueryTest, InputCountZeroOrNegativeSendsNoRequest,
                            InputCountZeroReportsValidIdleEverySecond,
                            ThreeInputsWithInputTwoActiveNeverAskInputThree,
                            IdleInputsAreAllAskedInOrder, KeyInput10MatchesInputOne,
                            ValueIsComparedOverItsOwnLength, KeyAndValueIgnoreCase,
                            TextXmlIsAccepted, OtherMediaTypeCountsAsIdleButTheReadingIsValid,
                            FailedRequestCountsAsIdleAndTheNextInputIsAsked,
                            MatchingLineMustBeAmongTheFirstTenLines, EmptyLinesInTheBody,
                            MismatchedValueIsPassedOver,
                            KeyWithoutValueOrLineWithoutTokenEndsTheScan,
                            CredentialsAnswerTheCamerasChallenge,
                            NullCameraFailsTheReadingAndTheLoopReportsNothing,
                            LoopReportsStateWithValidityAndFinalFalse);

}  // namespace evtest

#endif  // EVWATCH_TESTS_DETECTORS_INPUTQUERY_CASES_H_
