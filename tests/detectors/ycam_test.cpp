#include "detectors/ycam.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::Binary;
using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;
using evtest::Respond;

const char kArm[] = "/stream.arm";

// The 8-byte record: four area levels, the flag bits, three reserved bytes.
std::string Record(unsigned char l0, unsigned char l1, unsigned char l2, unsigned char l3,
                   unsigned char flags) {
  return std::string{static_cast<char>(l0), static_cast<char>(l1), static_cast<char>(l2),
                     static_cast<char>(l3), static_cast<char>(flags), 0, 0, 0};
}

class YcamTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body,
                 const std::string& type = "application/octet-stream") {
    cam_.Answer(kArm, Respond(200, type, body));
    YCAMMD detector(&camera_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "secret")};
};

TEST_F(YcamTest, FlagOnAreaOneStopsTheWalkBeforeAreaThree) {
  Reading r = Motion(Record(10, 50, 20, 90, 0x02));
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 50u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kArm}));
}

TEST_F(YcamTest, WithoutFlagsTheLargestLevelIsReportedWithoutMotion) {
  Reading r = Motion(Record(10, 50, 20, 90, 0x00));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 90u);
}

TEST_F(YcamTest, LevelIsTheLargestUpToTheFirstFlaggedArea) {
  Reading r = Motion(Record(60, 5, 30, 90, 0x04));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 60u);
  r = Motion(Record(10, 50, 20, 90, 0x01 | 0x08));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 10u);
  r = Motion(Record(10, 50, 20, 90, 0x08));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 90u);
}

TEST_F(YcamTest, OnlyTheLowFourFlagBitsCount) {
  Reading r = Motion(Record(10, 50, 20, 30, 0xF0));
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 50u);
}

TEST_F(YcamTest, LevelBytesAreUnsigned) {
  Reading r = Motion(Record(200, 0, 0, 0, 0x01));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 200u);
}

TEST_F(YcamTest, ShortRecordFails) {
  Reading r = Motion(Record(10, 50, 20, 90, 0x02).substr(0, 7));
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(YcamTest, LongerAnswerIsReadForItsFirstEightBytes) {
  Reading r = Motion(Record(10, 50, 20, 90, 0x02) + "trailing");
  EXPECT_EQ(r.result, 0);
  EXPECT_EQ(r.level, 50u);
}

TEST_F(YcamTest, OnlyOctetStreamIsAccepted) {
  EXPECT_EQ(Motion(Record(10, 0, 0, 0, 1), "text/plain").result, -1);
  EXPECT_EQ(Motion(Record(10, 0, 0, 0, 1), "application/octet").result, -1);
  EXPECT_EQ(Motion(Record(10, 0, 0, 0, 1), "").result, -1);
  Reading r = Motion(Record(10, 0, 0, 0, 1), "Application/Octet-Stream; x=1");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
}

TEST_F(YcamTest, HttpErrorFails) {
  cam_.Answer(kArm, Respond(401, "application/octet-stream", Record(10, 0, 0, 0, 1)));
  YCAMMD detector(&camera_);
  bool state = true;
  unsigned int level = 3;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
}

TEST_F(YcamTest, LoopRunsAtTheBoundIntervalAndReportsLevels) {
  cam_.Answer(kArm, Binary(Record(10, 50, 20, 90, 0x02)));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  YCAMMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  // A one-second period would need far longer than this deadline for six reports.
  ASSERT_TRUE(recorder.WaitForCount(6, std::chrono::seconds(4)));
  cam_.Answer(kArm, Binary(Record(10, 50, 20, 90, 0x00)));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 90}));
  cam_.Answer(kArm, Binary("short"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{true, 50}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kArm);
}

TEST_F(YcamTest, NullCameraFailsEveryPassOfTheLoop) {
  YCAMMD detector(nullptr);
  bool state = true;
  unsigned int level = 3;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

}  // namespace
