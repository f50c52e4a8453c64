// HikVisionMD and HikVisionEID against a fake camera that pushes an alert stream: judging
// single records, the parts each pass judges, what the loop reports (and does not), the pass
// counter's wrap, and recovery after the camera went away.

#include "detectors/hikvision.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::FetchFrom;
using evtest::Push;
using evtest::PushHandler;
using evtest::Report;

const char kPath[] = "/Event/notification/alertStream";
const char kXmlType[] = "application/xml; charset=\"UTF-8\"";
const char kHikNamespace[] = "http://www.hikvision.com/ver10/XMLSchema";

// An alert record as the camera sends it; an empty field leaves its element out.
std::string Alert(const std::string& type, const std::string& state, const std::string& count,
                  int input = 0, const std::string& ns = kHikNamespace) {
  std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\r\n<EventNotificationAlert version=\"1.0\"";
  if (!ns.empty()) xml += " xmlns=\"" + ns + "\"";
  xml +=
      ">\r\n<ipAddress>10.0.0.7</ipAddress>\r\n<protocol>HTTP</protocol>\r\n"
      "<channelID>1</channelID>\r\n<dateTime>2024-05-01T10:00:00+08:00</dateTime>\r\n";
  if (!count.empty()) xml += "<activePostCount>" + count + "</activePostCount>\r\n";
  if (!type.empty()) xml += "<eventType>" + type + "</eventType>\r\n";
  if (!state.empty()) xml += "<eventState>" + state + "</eventState>\r\n";
  if (input > 0) xml += "<inputIOPortID>" + std::to_string(input) + "</inputIOPortID>\r\n";
  return xml + "<eventDescription>alarm</eventDescription>\r\n</EventNotificationAlert>\r\n";
}

std::string Vmd(int count) { return Alert("VMD", "active", std::to_string(count)); }
std::string Io(const std::string& state, int input = 1) { return Alert("IO", state, "1", input); }
std::string Heartbeat() { return Alert("videoloss", "inactive", "0"); }

// The record padded with blanks after its end to exactly `size` bytes.
std::string PaddedTo(const std::string& record, size_t size) {
  return record + std::string(size - record.size(), ' ');
}

class HikVisionTest : public ::testing::Test {
 protected:
  int JudgeMotion(HikVisionMD& detector, std::string record) {
    return detector.IsMotionDetected(&record[0], static_cast<int>(record.size()));
  }
  int JudgeInput(HikVisionEID& detector, std::string record) {
    return detector.IsEventDetected(&record[0], static_cast<int>(record.size()));
  }
  void Push(std::vector<std::string> parts, Push::End end = Push::kHold) {
    cam_.Handle(
        kPath,
        PushHandler({evtest::Push{std::move(parts), end, std::chrono::milliseconds(2), kXmlType}}));
  }
  void PushEach(std::vector<evtest::Push> pushes) {
    for (auto& p : pushes) p.content_type = kXmlType;
    cam_.Handle(kPath, PushHandler(std::move(pushes)));
  }
  // Runs the detector until the recorder holds n reports, then stops it.
  template <class Detector>
  std::vector<Report> RunUntil(Detector& detector, size_t n) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    EXPECT_EQ(detector.Init(&buffer, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitForCount(n, std::chrono::seconds(20)));
    EXPECT_EQ(detector.Stop(), 0);
    return recorder.Reports();
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(HikVisionTest, MotionRecordIsMotionWhenItsPostCountChanged) {
  HikVisionMD md(&camera_);
  EXPECT_EQ(JudgeMotion(md, Vmd(5)), 3);
  EXPECT_EQ(JudgeMotion(md, Vmd(5)), 2);
  EXPECT_EQ(JudgeMotion(md, Vmd(6)), 3);
  EXPECT_EQ(JudgeMotion(md, Vmd(5)), 3) << "any change counts, down as well as up";
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "inactive", "5")), 2) << "eventState is not looked at";
}

TEST_F(HikVisionTest, FirstMotionRecordWithCountZeroIsNoMotion) {
  HikVisionMD md(&camera_);
  EXPECT_EQ(JudgeMotion(md, Vmd(0)), 2);
}

TEST_F(HikVisionTest, LowerCaseVmdIsNotAMotionRecord) {
  HikVisionMD md(&camera_);
  EXPECT_EQ(JudgeMotion(md, Alert("vmd", "active", "5")), 1);
  EXPECT_EQ(JudgeMotion(md, Alert("IO", "active", "5")), 1);
  EXPECT_EQ(JudgeMotion(md, Vmd(5)), 3) << "the skipped records left the stored count at 0";
}

TEST_F(HikVisionTest, NonNumericPostCountConvertsToZero) {
  HikVisionMD md(&camera_);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "abc")), 2);
  EXPECT_EQ(JudgeMotion(md, Vmd(5)), 3);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "abc")), 3);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "0")), 2);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "12abc")), 3);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "12")), 2);
}

TEST_F(HikVisionTest, MissingElementsAreNotJudged) {
  HikVisionMD md(&camera_);
  HikVisionEID eid(&camera_, 1);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "")), 1);
  EXPECT_EQ(JudgeMotion(md, Alert("", "active", "5")), 1);
  EXPECT_EQ(JudgeInput(eid, Alert("IO", "", "1")), 1);
  EXPECT_EQ(JudgeInput(eid, Alert("", "active", "1")), 1);
}

TEST_F(HikVisionTest, UnparsableOrForeignRecordsAreNotJudged) {
  HikVisionMD md(&camera_);
  HikVisionEID eid(&camera_, 1);
  EXPECT_EQ(JudgeMotion(md, "not xml at all"), 1);
  EXPECT_EQ(JudgeMotion(md, Vmd(5).substr(0, 200)), 1);
  EXPECT_EQ(
      JudgeMotion(md,
                  "<Alert><eventType>VMD</eventType><activePostCount>5</activePostCount></Alert>"),
      1);
  EXPECT_EQ(
      JudgeInput(
          eid, "<EventNotificationAlert><eventType>IO</eventType><eventState>active</eventState>"),
      1);
  EXPECT_EQ(JudgeMotion(md, ""), 1);
}

TEST_F(HikVisionTest, RecordsWithOrWithoutNamespacesAreRead) {
  HikVisionMD md(&camera_);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "1", 0, "")), 3);
  EXPECT_EQ(JudgeMotion(md, Alert("VMD", "active", "2", 0, "urn:psialliance-org")), 3);
  EXPECT_EQ(JudgeMotion(md,
                        "<p:EventNotificationAlert xmlns:p=\"urn:x\"><p:eventType>VMD</p:eventType>"
                        "<p:activePostCount>3</p:activePostCount></p:EventNotificationAlert>"),
            3);
}

TEST_F(HikVisionTest, RecordTextEndsAtItsFirstZeroByte) {
  HikVisionMD md(&camera_);
  std::string record = Vmd(4) + std::string(1, '\0') + "<trailing garbage";
  EXPECT_EQ(JudgeMotion(md, record), 3);
}

TEST_F(HikVisionTest, OnlyExactlyActiveIsAnActiveInput) {
  HikVisionEID eid(&camera_, 1);
  EXPECT_EQ(JudgeInput(eid, Io("active")), 3);
  EXPECT_EQ(JudgeInput(eid, Io("Active")), 2);
  EXPECT_EQ(JudgeInput(eid, Io("inactive")), 2);
  EXPECT_EQ(JudgeInput(eid, Io("ACTIVE")), 2);
  EXPECT_EQ(JudgeInput(eid, Alert("io", "active", "1")), 1);
  EXPECT_EQ(JudgeInput(eid, Vmd(5)), 1);
  EXPECT_EQ(JudgeInput(eid, Heartbeat()), 1);
}

TEST_F(HikVisionTest, InputNumberHasNoEffect) {
  for (int input : {0, 1, 3, 99}) {
    HikVisionEID eid(&camera_, input);
    EXPECT_EQ(JudgeInput(eid, Io("active", 1)), 3) << input;
    EXPECT_EQ(JudgeInput(eid, Io("active", 7)), 3) << input;
    EXPECT_EQ(JudgeInput(eid, Alert("IO", "active", "1")), 3) << input;
  }
}

TEST_F(HikVisionTest, DoMDJudgesOnlyWhenTheCounterModulo4Is1) {
  Push({Vmd(5), Vmd(5), Vmd(5), Vmd(5), Vmd(5), Vmd(5)});
  auto fetch = FetchFrom(cam_, kPath);
  HikVisionMD md(&camera_);
  bool motion = true;
  unsigned int level = 7;
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 1);  // counter 0
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  md.SetPartCounter(1);
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 3);
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 100u);
  md.SetPartCounter(5);
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 2);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  for (int counter : {2, 3, 4}) {
    md.SetPartCounter(counter);
    EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 1) << counter;
  }
  EXPECT_EQ(md.PartCounter(), 4) << "DoMD leaves the counter to the loop";
}

TEST_F(HikVisionTest, DoEIDJudgesOnlyWhenTheCounterModulo4Is0) {
  Push({Io("active"), Io("active"), Io("active"), Io("inactive")});
  auto fetch = FetchFrom(cam_, kPath);
  HikVisionEID eid(&camera_, 1);
  bool active = false;
  EXPECT_EQ(eid.DoEID(fetch.get(), active), 3);  // counter 0
  EXPECT_TRUE(active);
  eid.SetPartCounter(1);
  EXPECT_EQ(eid.DoEID(fetch.get(), active), 1);
  EXPECT_FALSE(active);
  eid.SetPartCounter(4);
  EXPECT_EQ(eid.DoEID(fetch.get(), active), 3);
  EXPECT_TRUE(active);
  EXPECT_EQ(eid.DoEID(fetch.get(), active), 2);
  EXPECT_FALSE(active);
}

TEST_F(HikVisionTest, PartsOf1024And1025BytesAreJudgedWhole) {
  const std::string short_part = PaddedTo(Vmd(8), 1024);
  const std::string long_part = PaddedTo(Vmd(9), 1025);
  ASSERT_EQ(short_part.size(), 1024u);
  Push({short_part, long_part, Vmd(9), PaddedTo(Vmd(10), 5000)});
  auto fetch = FetchFrom(cam_, kPath);
  HikVisionMD md(&camera_);
  md.SetPartCounter(1);
  bool motion = false;
  unsigned int level = 0;
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 3);
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 3);
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 2) << "a short part after a long one";
  EXPECT_EQ(md.DoMD(fetch.get(), motion, level), 3);
}

TEST_F(HikVisionTest, NoFetcherOrFailedHeaderIsZeroAndFailedBodyIsOne) {
  HikVisionMD md(&camera_);
  HikVisionEID eid(&camera_, 1);
  bool motion = true;
  unsigned int level = 7;
  EXPECT_EQ(md.DoMD(nullptr, motion, level), 0);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  bool active = true;
  EXPECT_EQ(eid.DoEID(nullptr, active), 0);
  EXPECT_FALSE(active);

  Push({}, Push::kClose);
  auto closed = FetchFrom(cam_, kPath);
  EXPECT_EQ(md.DoMD(closed.get(), motion, level), 0);

  const std::string record = Vmd(5);
  cam_.Handle(kPath, [record](evsim::HttpConnection& c) {
    evtest::MultipartWriter w(c);
    w.Begin();
    w.Raw("--myboundary\r\nContent-Type: application/xml\r\nContent-Length: 2000\r\n\r\n" + record);
  });
  auto cut = FetchFrom(cam_, kPath);
  md.SetPartCounter(1);
  EXPECT_EQ(md.DoMD(cut.get(), motion, level), 1);
  EXPECT_FALSE(motion);
}

TEST_F(HikVisionTest, LoopJudgesEveryFourthPartCounts005) {
  Push({Vmd(0), Vmd(0), Vmd(5)}, Push::kRepeatLast);
  HikVisionMD md(&camera_);
  std::vector<Report> reports = RunUntil(md, 3);
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{false, 0}));   // pass 1: count 0, as stored
  EXPECT_EQ(reports[1], (Report{true, 100}));  // pass 5: count 5
  EXPECT_EQ(reports[2], (Report{false, 0}));   // pass 9: count 5 again
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Count(kPath), 1) << "one stream for the whole loop";
}

TEST_F(HikVisionTest, LoopJudgesTheSecondSixthAndTenthParts) {
  // Had any other part been judged, a count of 9 would differ from the stored one.
  Push({Vmd(9), Vmd(7), Vmd(9), Vmd(9), Vmd(9), Vmd(7), Vmd(9), Vmd(9), Vmd(9), Vmd(9)},
       Push::kRepeatLast);
  HikVisionMD md(&camera_);
  std::vector<Report> reports = RunUntil(md, 4);
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{true, 100}));  // part 2: 7
  EXPECT_EQ(reports[1], (Report{false, 0}));   // part 6: 7
  EXPECT_EQ(reports[2], (Report{true, 100}));  // part 10: 9
  EXPECT_EQ(reports[3], (Report{false, 0}));   // part 14: 9
}

TEST_F(HikVisionTest, EidLoopNeverReportsItsFirstJudgedPass) {
  Push({Io("active"), Vmd(1), Vmd(2), Vmd(3), Io("inactive"), Vmd(4), Vmd(5), Vmd(6), Io("active")},
       Push::kRepeatLast);
  HikVisionEID eid(&camera_, 1);
  std::vector<Report> reports = RunUntil(eid, 3);
  ASSERT_GE(reports.size(), 3u);
  EXPECT_EQ(reports[0], (Report{false, 1}));  // part 5; part 1's active was not reported
  EXPECT_EQ(reports[1], (Report{true, 1}));   // part 9
  EXPECT_EQ(reports[2], (Report{true, 1}));   // part 13
}

TEST_F(HikVisionTest, RecordsOfOtherTypesReportNothing) {
  std::vector<std::string> parts(12, Heartbeat());
  parts.push_back(Vmd(5));
  Push(parts, Push::kRepeatLast);
  HikVisionMD md(&camera_);
  std::vector<Report> reports = RunUntil(md, 1);
  ASSERT_GE(reports.size(), 1u);
  EXPECT_EQ(reports[0], (Report{true, 100}))
      << "the heartbeats judged on passes 1, 5, 9 reported nothing";
}

TEST_F(HikVisionTest, FailedHeaderReportsFalseZeroEvenOnTheFirstPass) {
  PushEach({evtest::Push{{}, Push::kClose, {}, "", 503},
            evtest::Push{{Vmd(3)}, Push::kRepeatLast, std::chrono::milliseconds(2)}});
  HikVisionMD md(&camera_);
  std::vector<Report> reports = RunUntil(md, 3);
  ASSERT_GE(reports.size(), 3u);
  EXPECT_EQ(reports[0], (Report{false, 0}));   // pass 0: refused
  EXPECT_EQ(reports[1], (Report{true, 100}));  // pass 1: count 3
  EXPECT_EQ(reports[2], (Report{false, 0}));   // pass 5: count 3 again
}

TEST_F(HikVisionTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  PushEach({evtest::Push{{Vmd(1), Vmd(2), Vmd(3), Vmd(4), Vmd(5), Vmd(6)}, Push::kClose},
            evtest::Push{{}, Push::kClose, {}, "", 503},
            evtest::Push{{Vmd(20), Vmd(21), Vmd(22), Vmd(23), Vmd(24), Vmd(25), Vmd(26), Vmd(27)},
                         Push::kRepeatLast,
                         std::chrono::milliseconds(2)}});
  HikVisionMD md(&camera_);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(md.Init(&buffer, 500), 0);
  ASSERT_EQ(md.Start(), 0);
  // Motion on the first stream, (false, 0) while the camera is away, motion again after.
  auto back_again = [](const std::vector<Report>& r) {
    size_t i = 0;
    while (i < r.size() && !(r[i] == Report{true, 100})) ++i;
    while (i < r.size() && !(r[i] == Report{false, 0})) ++i;
    while (i < r.size() && !(r[i] == Report{true, 100})) ++i;
    return i < r.size();
  };
  EXPECT_TRUE(recorder.WaitFor(back_again, std::chrono::seconds(20)));
  ASSERT_EQ(md.Stop(), 0);
  EXPECT_EQ(recorder.Reports()[0], (Report{true, 100}));
  EXPECT_GE(cam_.Count(kPath), 3);
}

TEST_F(HikVisionTest, CounterWrapsAt2147483647AndShiftsTheJudgedParts) {
  // From 2147483645 the counter runs 2147483646, 0, 1: the part after next-but-one is judged
  // (a count of 1, as stored: no motion). Without the wrap the fifth part (9) would be.
  Push({Vmd(1), Vmd(9), Vmd(9), Vmd(1), Vmd(9), Vmd(9), Vmd(9), Vmd(2)}, Push::kRepeatLast);
  HikVisionMD md(&camera_);
  md.SetPartCounter(2147483645);
  std::vector<Report> reports = RunUntil(md, 3);
  ASSERT_GE(reports.size(), 3u);
  EXPECT_EQ(reports[0], (Report{false, 0}));   // part 4, counter 1
  EXPECT_EQ(reports[1], (Report{true, 100}));  // part 8, counter 5: 2
  EXPECT_EQ(reports[2], (Report{false, 0}));   // part 12, counter 9: 2 again
  EXPECT_GE(md.PartCounter(), 10);
  EXPECT_LT(md.PartCounter(), 1000000);
}

TEST_F(HikVisionTest, EidCounterWrapsToo) {
  Push({Io("active"), Vmd(1), Vmd(1), Io("inactive"), Io("active"), Vmd(1), Vmd(1), Io("active")},
       Push::kRepeatLast);
  HikVisionEID eid(&camera_, 1);
  eid.SetPartCounter(2147483644);
  std::vector<Report> reports = RunUntil(eid, 2);
  ASSERT_GE(reports.size(), 2u);
  EXPECT_EQ(reports[0],
            (Report{false, 1}));             // part 4, counter 0 (without the wrap: part 5, active)
  EXPECT_EQ(reports[1], (Report{true, 1}));  // part 8, counter 4
}

TEST_F(HikVisionTest, WithoutCameraTheLoopEndsAtOnceReportingNothing) {
  HikVisionMD md(nullptr);
  HikVisionEID eid(nullptr, 1);
  for (DetectorBase* d : {static_cast<DetectorBase*>(&md), static_cast<DetectorBase*>(&eid)}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(d->Init(&buffer, 500), 0);
    ASSERT_EQ(d->Start(), 0);
    ASSERT_EQ(d->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(HikVisionTest, LoopAsksTheAlertStreamOnTheCamerasPortWithCredentials) {
  cam_.RequireAuth(evsim::AuthScheme::kDigest, "admin", "12345");
  Push({Vmd(1), Vmd(2)}, Push::kRepeatLast);
  Camera camera(cam_.Record("admin", "12345"));
  HikVisionMD md(&camera);
  std::vector<Report> reports = RunUntil(md, 1);
  ASSERT_GE(reports.size(), 1u);
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath, kPath}))
      << "challenge, then the stream";
}

}  // namespace
