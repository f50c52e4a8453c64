#include "detectors/canon.h"

#include <gtest/gtest.h>

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

const char kInfo[] = "/-wvhttp-01-/info.cgi";

class CanonTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(kInfo, Respond(200, type, body));
    CanonMD detector(&camera_);
    Reading r{0, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Input(const std::string& body, int input = 1) {
    cam_.Answer(kInfo, Text(body));
    CanonEID detector(&camera_, input);
    Reading r{0, true, 0};
    r.result = detector.DoEID(r.state);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("root", "secret")};
};

TEST_F(CanonTest, MotionLineGivesLevel100) {
  Reading r = Motion("m.1:=1\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kInfo}));
}

TEST_F(CanonTest, NoMotionOrOtherWindow) {
  Reading r = Motion("m.1:=0\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  r = Motion("m.2:=1\r\n");
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(CanonTest, CapitalMPassesPrefixButFailsTheScan) {
  Reading r = Motion("M.1:=1\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(CanonTest, LastMotionLineWinsUnlessAnEmptyLineComesFirst) {
  EXPECT_FALSE(Motion("m.1:=1\r\nm.1:=0\r\n").state);
  EXPECT_TRUE(Motion("m.1:=1\r\n\r\nm.1:=0\r\n").state);
}

TEST_F(CanonTest, HundredAndFirstLineIsNeverRead) {
  std::string body;
  for (int i = 0; i < 100; ++i) body += "s.x:=0\r\n";
  EXPECT_FALSE(Motion(body + "m.1:=1\r\n").state);
  body.clear();
  for (int i = 0; i < 99; ++i) body += "s.x:=0\r\n";
  EXPECT_TRUE(Motion(body + "m.1:=1\r\n").state);
}

TEST_F(CanonTest, TextHtmlIsAFailedPoll) {
  Reading r = Motion("m.1:=1\r\n", "text/html");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(CanonTest, PlainTypeWithParametersAndAnyCase) {
  EXPECT_TRUE(Motion("m.1:=1\r\n", "TEXT/PLAIN; charset=x").state);
}

TEST_F(CanonTest, HttpErrorAndNullCameraFail) {
  cam_.Answer(kInfo, Respond(500, "text/plain", "m.1:=1\r\n"));
  CanonMD detector(&camera_);
  bool state = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  CanonEID none(nullptr, 1);
  EXPECT_EQ(none.DoEID(state), -1);
}

TEST_F(CanonTest, AnyActiveInputCountsWhateverTheConfiguredNumber) {
  EXPECT_TRUE(Input("i.1:=0\r\ni.2:=1\r\n", 1).state);
  EXPECT_TRUE(Input("i.2:=1\r\n", 5).state);
  EXPECT_FALSE(Input("i.0:=1\r\n", 1).state);
  EXPECT_FALSE(Input("i.1:=0\r\ni.2:=0\r\n", 2).state);
}

TEST_F(CanonTest, UnparsableInputLinesAssignNothing) {
  // "I." passes the prefix test but not the scan; "i.x" fails at the index: neither
  // assigns a value, which stays 0.
  EXPECT_FALSE(Input("I.1:=1\r\n", 1).state);
  EXPECT_FALSE(Input("i.x:=1\r\n", 1).state);
}

TEST_F(CanonTest, ShortAnswerAfterLongOneReadsNoStaleLines) {
  std::string longBody;
  for (int i = 0; i < 50; ++i) longBody += "x.y:=0\r\n";
  longBody += "m.1:=1\r\n";
  EXPECT_TRUE(Motion(longBody).state);
  EXPECT_FALSE(Motion("m.1:=0").state);
}

TEST_F(CanonTest, MotionLoopReportsEverySecondAndFinalFalse) {
  cam_.Answer(kInfo, Text("m.1:=1\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  CanonMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  cam_.Answer(kInfo, Respond(404, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // One request per pass, each to the info CGI with the camera's credentials.
  EXPECT_GE(cam_.Count(kInfo), 3);
  for (const auto& target : cam_.Targets()) EXPECT_EQ(target, kInfo);
}

TEST_F(CanonTest, InputLoopReportsValidityAndFailure) {
  cam_.Answer(kInfo, Text("i.1:=1\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  CanonEID detector(&camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(kInfo, Text("i.1:=0\r\n"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  cam_.Answer(kInfo, Respond(200, "text/html", "i.1:=1\r\n"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

TEST_F(CanonTest, CredentialsAnswerTheCamerasChallenge) {
  cam_.RequireAuth(evsim::AuthScheme::kDigest, "root", "secret");
  Reading r = Motion("m.1:=1\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
}

}  // namespace
