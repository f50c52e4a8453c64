#include "detectors/mobotix.h"

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
using evtest::Reply;
using evtest::Report;
using evtest::Respond;
using evtest::Text;

const char kMotion[] = "/control/event.jpg?output=alarmupdate&filter=VM";
const char kInput[] = "/control/event.jpg?output=alarmupdate&filter=SI";

class MobotixTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  static Reading Read(MobotixMD& detector) {
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "meinsm")};
};

TEST_F(MobotixTest, CounterThatStaysGivesNoEventAndOneThatMovedGivesAnEvent) {
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=5;x=1\r\n"), Text("alarmcounter=5;x=1\r\n"),
                                Text("alarmcounter=4\r\n"), Text("alarmcounter=5;x=1\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  Reading r = Read(detector);  // 5 after the start value 0
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  r = Read(detector);  // 5 after 5
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  r = Read(detector);  // 4 after 5: a move down counts too
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  r = Read(detector);  // 5 after 4
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(4, kMotion)));
}

TEST_F(MobotixTest, InputTypeAsksTheSignalInputAndReportsLevelOne) {
  cam_.AnswerSequence(kInput, {Text("alarmcounter=4\r\n"), Text("alarmcounter=5;x=1\r\n"),
                               Text("alarmcounter=5;x=1\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_INPUT);
  Read(detector);
  Reading r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 1u);
  r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(3, kInput)));
}

TEST_F(MobotixTest, CounterWithoutSemicolonParsesWhole) {
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=7\r\n"), Text("alarmcounter=7\r\n"),
                                Text("alarmcounter=70\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  EXPECT_TRUE(Read(detector).state);
  EXPECT_FALSE(Read(detector).state) << "7 read twice";
  EXPECT_TRUE(Read(detector).state) << "70 is not 7";
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(3, kMotion)));
}

TEST_F(MobotixTest, CounterIsFoundInsideTheLineAndCutAtTheFirstSemicolon) {
  cam_.AnswerSequence(kMotion, {Text("time=12:00;alarmcounter=9;level=3\r\n"),
                                Text("xalarmcounter=9\r\n"), Text("alarmcounter=9;alarmcounter=1\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  EXPECT_TRUE(Read(detector).state);
  EXPECT_FALSE(Read(detector).state);
  EXPECT_FALSE(Read(detector).state);
}

TEST_F(MobotixTest, LineWithoutCounterIsAReadingOfNoEventThatKeepsTheCounter) {
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=3\r\n"), Text("no alarm here\r\n"),
                                Text("AlarmCounter=8\r\nalarmcounter=8\r\n"), Text("alarmcounter=3\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  EXPECT_TRUE(Read(detector).state);
  Reading r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state) << "the key is case-sensitive and only the first line is read";
  r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state) << "3 is still the last counter";
}

TEST_F(MobotixTest, ValueThatIsNotANumberReadsAsZero) {
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=abc\r\n"), Text("alarmcounter=2\r\n"),
                                Text("alarmcounter=\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  EXPECT_FALSE(Read(detector).state) << "0 after the start value 0";
  EXPECT_TRUE(Read(detector).state);
  EXPECT_TRUE(Read(detector).state) << "empty reads as 0, which is not 2";
}

TEST_F(MobotixTest, FailuresGiveMinusOneAndKeepTheCounter) {
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=6\r\n"), Respond(401, "text/plain", "alarmcounter=1\r\n"),
                                Text(""), Text("\r\nalarmcounter=1\r\n"), Text("alarmcounter=6\r\n")});
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  EXPECT_TRUE(Read(detector).state);
  for (const char* what : {"status 401", "empty body", "empty first line"}) {
    Reading r = Read(detector);
    EXPECT_EQ(r.result, -1) << what;
    EXPECT_FALSE(r.state) << what;
    EXPECT_EQ(r.level, 0u) << what;
  }
  Reading r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state) << "6 after 6: failures do not touch the counter";
  EXPECT_EQ(cam_.Count(kMotion), 5);
}

TEST_F(MobotixTest, AnswerWithoutContentTypeIsRead) {
  cam_.Answer(kMotion, evtest::Raw("HTTP/1.1 200 OK\r\nContent-Length: 16\r\nConnection: close\r\n\r\n"
                                   "alarmcounter=1\r\n"));
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  Reading r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
}

TEST_F(MobotixTest, NullCameraFails) {
  MobotixMD detector(nullptr, EVENT_DET_MOTION);
  Reading r = Read(detector);
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  bool changed = true;
  EXPECT_EQ(detector.SendReqAndGetResp(nullptr, kMotion, changed), -1);
}

TEST_F(MobotixTest, OtherTypeAsksTheEmptyPathAndReportsLevelOne) {
  cam_.AnswerSequence("/", {Text("alarmcounter=3\r\n")});
  MobotixMD detector(&camera_, static_cast<EVENT_DET_TYPE>(2));
  Reading r = Read(detector);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 1u);
  MobotixMD negative(&camera_, static_cast<EVENT_DET_TYPE>(-1));
  EXPECT_EQ(Read(negative).result, 0);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{"/", "/"}));
}

TEST_F(MobotixTest, FirstSuccessfulReadingOfARunIsNotReported) {
  // The first counter is not 0: were it reported, the first report would be an event.
  cam_.AnswerSequence(kMotion, {Text("alarmcounter=5\r\n"), Text("alarmcounter=5\r\n"),
                                Text("alarmcounter=6\r\n"), Text("alarmcounter=6\r\n")});
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(4));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{false, 0})) << "second reading: 5 after 5";
  EXPECT_EQ(reports[1], (Report{true, 100})) << "third reading: 6 after 5";
  EXPECT_EQ(reports[2], (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // One report per request but the first, and the final one.
  EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kMotion)));
}

TEST_F(MobotixTest, FailedFirstReadingIsReported) {
  cam_.AnswerSequence(kInput, {Respond(500, "text/plain", ""), Text("alarmcounter=5\r\n"),
                               Text("alarmcounter=5\r\n")});
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MobotixMD detector(&camera_, EVENT_DET_INPUT);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{false, 0})) << "the failure";
  EXPECT_EQ(reports[1], (Report{true, 1})) << "5 after the start value 0, now reported";
  EXPECT_EQ(reports[2], (Report{false, 0}));
  EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kInput)) + 1);
}

TEST_F(MobotixTest, EveryRunSkipsItsOwnFirstReading) {
  cam_.Answer(kMotion, Text("alarmcounter=5\r\n"));
  EventBuf buffer;
  MobotixMD detector(&camera_, EVENT_DET_MOTION);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  for (int run = 0; run < 2; ++run) {
    EventRecorder recorder(buffer);
    cam_.ClearLog();
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(cam_.WaitForRequests(3));
    ASSERT_EQ(detector.Stop(), 0);
    std::vector<Report> reports = recorder.Reports();
    EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kMotion))) << "run " << run;
    for (const Report& r : reports) EXPECT_EQ(r, (Report{false, 0})) << "run " << run;
  }
}

}  // namespace
