#include "detectors/messoa.h"

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

const char kStatus[] = "/cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus";

// A whole answer: the section header, the lines given, and filler up to ten lines so that
// the scan neither runs off the end nor misses the key.
std::string Section(const std::string& lines) { return "[AlarmStatus]\r\n" + lines; }
std::string Filler(int count, const std::string& line = "Other=0") {
  std::string body;
  for (int i = 0; i < count; ++i) body += line + "\r\n";
  return body;
}

class MessoaTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(kStatus, Respond(200, type, body));
    MessoaMD detector(&camera_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Input(const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(kStatus, Respond(200, type, body));
    MessoaEID detector(&camera_, 1);
    Reading r{7, true, 0};
    r.result = detector.DoEID(r.state);
    return r;
  }
  // Both readings of one answer whose Mode line is `mode`.
  void ExpectMode(const std::string& modeLine, bool motion, bool input) {
    const std::string body = Section(modeLine + "\r\n" + Filler(8));
    Reading m = Motion(body);
    EXPECT_EQ(m.result, 0) << modeLine;
    EXPECT_EQ(m.state, motion) << modeLine;
    EXPECT_EQ(m.level, motion ? 100u : 0u) << modeLine;
    Reading i = Input(body);
    EXPECT_EQ(i.result, 0) << modeLine;
    EXPECT_EQ(i.state, input) << modeLine;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "1234")};
};

TEST_F(MessoaTest, ModeThreeIsMotionAndInput) {
  ExpectMode("Mode=3", true, true);
  EXPECT_EQ(cam_.Targets(), (Targets{kStatus, kStatus}));
}

TEST_F(MessoaTest, ModeTwoIsMotionOnlyAndModeOneInputOnly) {
  ExpectMode("Mode=2", true, false);
  ExpectMode("Mode=1", false, true);
}

TEST_F(MessoaTest, OtherCodesAreNeitherAndTheWholeTokenIsCompared) {
  ExpectMode("Mode=0", false, false);
  ExpectMode("Mode=4", false, false);
  ExpectMode("Mode=03", false, false);
  ExpectMode("Mode=31", false, false);
  ExpectMode("Mode=1x", false, false);
}

TEST_F(MessoaTest, BlanksAndApostrophesAroundTheValueAreNotPartOfIt) {
  ExpectMode("Mode='3'", true, true);
  ExpectMode("Mode= 2 ", true, false);
  ExpectMode("Mode: '1' extra", false, true);
}

TEST_F(MessoaTest, KeyIsAPrefixComparedWithoutRegardToCase) {
  ExpectMode("mode=3", true, true);
  ExpectMode("MODEX=2", true, false);
  ExpectMode("Mod=3", false, false);
}

TEST_F(MessoaTest, LinesBeforeTheSectionHeaderAreIgnored) {
  ExpectMode("Mode=3", true, true);
  cam_.ClearLog();
  const std::string body = "Other=0\r\nMode=3\r\n" + Section("Mode=1\r\n" + Filler(6));
  EXPECT_FALSE(Motion(body).state);
  EXPECT_TRUE(Input(body).state);
  // Any line beginning with "[" opens the section, whatever its name.
  EXPECT_TRUE(Motion("Mode=1\r\n[x\r\nMode=2\r\n").state);
}

TEST_F(MessoaTest, TheFirstMatchingLineAfterTheHeaderIsTaken) {
  const std::string body = Section("Alarm=1\r\nMode=2\r\nMode=1\r\n");
  EXPECT_TRUE(Motion(body).state);
  EXPECT_FALSE(Input(body).state);
}

TEST_F(MessoaTest, IgnoredLinesCountTowardsTheTenLines) {
  // Header as line 9, Mode as line 10: read.
  Reading r = Motion(Filler(8, "junk") + Section("Mode=3\r\n"));
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  // Header as line 10, Mode as line 11: never read; a missing key is a valid reading.
  r = Motion(Filler(9, "junk") + Section("Mode=3\r\n"));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  r = Input(Filler(9, "junk") + Section("Mode=3\r\n"));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  // No header at all: nothing is examined.
  r = Input(Filler(10, "Mode=3"));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(MessoaTest, MissingKeyWithinTenLinesIsAValidIdleReading) {
  Reading r = Motion(Section(Filler(9)));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  r = Input(Section(Filler(9)));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(MessoaTest, BodyEndingBeforeTheKeyOrTheTenthLineFails) {
  EXPECT_EQ(Motion(Section("Other=1\r\n")).result, -1);
  EXPECT_EQ(Input(Section("Other=1\r\n")).result, -1);
  EXPECT_EQ(Input("").result, -1);
}

TEST_F(MessoaTest, LineWithoutTokenOrKeyWithoutValueAfterTheHeaderFails) {
  EXPECT_EQ(Motion(Section("\r\nMode=3\r\n" + Filler(8))).result, -1);
  EXPECT_EQ(Motion(Section(" := \r\nMode=3\r\n" + Filler(8))).result, -1);
  EXPECT_EQ(Input(Section("Mode=\r\n" + Filler(8))).result, -1);
  EXPECT_EQ(Input(Section("Mode= ''\r\n" + Filler(8))).result, -1);
  // Before the header the same lines are passed over.
  EXPECT_TRUE(Input("\r\nMode=\r\n" + Section("Mode=1\r\n")).state);
}

TEST_F(MessoaTest, OnlyTextAnswersAreRead) {
  const std::string body = Section("Mode=3\r\n");
  EXPECT_TRUE(Motion(body, "text/html; charset=UTF-8").state);
  EXPECT_TRUE(Input(body, "TEXT/plain").state);
  Reading r = Motion(body, "application/octet-stream");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(Input(body, "application/json").result, -1);
}

TEST_F(MessoaTest, FailedRequestFailsTheReading) {
  cam_.Answer(kStatus, Respond(500, "text/plain", Section("Mode=3\r\n")));
  MessoaMD motion(&camera_);
  bool state = true;
  unsigned int level = 5;
  EXPECT_EQ(motion.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  MessoaEID input(&camera_, 1);
  state = true;
  EXPECT_EQ(input.DoEID(state), -1);
  EXPECT_FALSE(state);
}

TEST_F(MessoaTest, CredentialsAnswerTheCamerasChallenge) {
  cam_.RequireAuth(evsim::AuthScheme::kDigest, "admin", "1234");
  EXPECT_TRUE(Motion(Section("Mode=3\r\n")).state);
}

TEST_F(MessoaTest, MotionLoopReportsLevelThenFailureThenFinalFalse) {
  cam_.Answer(kStatus, Text(Section("Mode=2\r\n")));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MessoaMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  cam_.Answer(kStatus, Respond(404, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.back() == Report{false, 0}; }));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  for (const Report& r : reports) EXPECT_TRUE(r == (Report{true, 100}) || r == (Report{false, 0}));
  // One request per pass, the final report without one.
  EXPECT_EQ(cam_.Targets(), Targets(cam_.Targets().size(), kStatus));
  EXPECT_EQ(cam_.Targets().size() + 1, reports.size());
}

TEST_F(MessoaTest, InputLoopReportsValidityAndMissingKeyIsValid) {
  cam_.Answer(kStatus, Text(Section("Mode=3\r\n")));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MessoaEID detector(&camera_, 4);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(kStatus, Text(Section(Filler(9))));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  cam_.Answer(kStatus, Respond(401, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.back() == Report{false, 0}; }));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

TEST_F(MessoaTest, NullCamera) {
  // The input loop ends at once and reports nothing.
  {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    MessoaEID detector(nullptr, 1);
    bool active = true;
    EXPECT_EQ(detector.DoEID(active), -1);
    EXPECT_FALSE(active);
    ASSERT_EQ(detector.Init(&buffer, 20), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_EQ(detector.Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  // The motion loop has no such test: every pass fails.
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MessoaMD detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

}  // namespace
