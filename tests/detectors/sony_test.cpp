// SONYMD and SONYEID against a fake camera that pushes alarm data at
// /command/alarmdata.cgi?interval=1 on the camera's own port.

#include "detectors/sony.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

#include "framework/host/camera.h"
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

const char kPath[] = "/command/alarmdata.cgi?interval=1";

class SonyTest : public ::testing::Test {
 protected:
  MotionReading Motion(const std::string& body) {
    SONYMD detector(&camera_);
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }
  InputReading Input(const std::string& body, int inputs) {
    SONYEID detector(&camera_, inputs);
    return ReadInputParts(cam_, kPath, detector, {body})[0];
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(SonyTest, WindowValueOneIsMotion) {
  EXPECT_EQ(Motion("OdWin1=1\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("OdWin1=0\r\nOdWin2=1\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("OdWin1=0\r\nOdWin2=0\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("OdWin1=2\r\n"), (MotionReading{0, false, 0}));
}

TEST_F(SonyTest, ValueIsComparedAsANumberWrittenBack) {
  EXPECT_EQ(Motion("OdWin1=01\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input("Sensor1=001\r\n", 1), (InputReading{0, true}));
}

TEST_F(SonyTest, SensorsAboveTheInputCountAreIgnored) {
  EXPECT_EQ(Input("Sensor3=1\r\n", 2), (InputReading{0, false}));
  EXPECT_EQ(Input("Sensor2=1\r\n", 2), (InputReading{0, true}));
  EXPECT_EQ(Input("Sensor1=0\r\nSensor3=1\r\nSensor2=1\r\n", 2), (InputReading{0, true}));
  // The comparison is signed: a count below 1 still watches the numbers at or below it.
  EXPECT_EQ(Input("Sensor0=1\r\n", 0), (InputReading{0, true}));
  EXPECT_EQ(Input("Sensor1=1\r\n", 0), (InputReading{0, false}));
  EXPECT_EQ(Input("Sensor-1=1\r\n", -1), (InputReading{0, true}));
}

TEST_F(SonyTest, EachKindReadsOnlyItsOwnLines) {
  EXPECT_EQ(Motion("Sensor1=1\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Input("OdWin1=1\r\n", 8), (InputReading{0, false}));
}

TEST_F(SonyTest, ALineEndingBeforeItsFirstFieldEndsTheScan) {
  EXPECT_EQ(Motion("OdWin\r\nOdWin1=1\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Input("Sens\r\nSensor1=1\r\n", 1), (InputReading{0, false}));
}

TEST_F(SonyTest, PartOf1025BytesIsReadWhole) {
  const std::string line = "Sensor1=1";
  EXPECT_EQ(Input(std::string(1025 - line.size(), '\n') + line, 1), (InputReading{0, true}));
  const std::string window = "OdWin4=1";
  EXPECT_EQ(Motion(std::string(1025 - window.size(), '\n') + window), (MotionReading{0, true, 100}));
}

TEST_F(SonyTest, NoFetcherIsAFailedReading) {
  SONYMD md(&camera_);
  MotionReading m{0, true, 9};
  m.result = md.DoMD(nullptr, m.motion, m.level);
  EXPECT_EQ(m, (MotionReading{-1, false, 0}));
  SONYEID eid(&camera_, 1);
  InputReading i{0, true};
  i.result = eid.DoEID(nullptr, i.active);
  EXPECT_EQ(i, (InputReading{-1, false}));
}

TEST_F(SonyTest, LoopsReadTheFixedPathOnTheCamerasPort) {
  cam_.Handle(kPath, PushHandler({Push{{"OdWin1=1\r\nSensor1=1\r\n", "OdWin1=0\r\nSensor1=0\r\n"},
                                       Push::kRepeatLast, std::chrono::milliseconds(5)}}));
  {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    SONYMD detector(&camera_);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitForCount(3));
    ASSERT_EQ(detector.Stop(), 0);
    std::vector<Report> reports = recorder.Reports();
    EXPECT_EQ(reports[0], (Report{true, 100}));
    EXPECT_EQ(reports[1], (Report{false, 0}));
    EXPECT_EQ(reports.back(), (Report{false, 0}));
  }
  {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    SONYEID detector(&camera_, 1);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitForCount(2));
    ASSERT_EQ(detector.Stop(), 0);
    std::vector<Report> reports = recorder.Reports();
    EXPECT_EQ(reports[0], (Report{true, 1}));
    EXPECT_EQ(reports[1], (Report{false, 1}));
    EXPECT_EQ(reports.back(), (Report{false, 0}));
  }
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath, kPath}));
}

TEST_F(SonyTest, WithoutCameraTheLoopsEndAtOnceReportingNothing) {
  SONYMD md(nullptr);
  SONYEID eid(nullptr, 1);
  for (DetectorBase* detector : std::vector<DetectorBase*>{&md, &eid}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
}

TEST_F(SonyTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  const std::string on = "OdWin1=1\r\nSensor1=1\r\n";
  {
    cam_.Handle(kPath, OutageHandler({on}, on));
    EventBuf buffer;
    EventRecorder recorder(buffer);
    SONYMD detector(&camera_);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.size() > 2 && r.back() == Report{true, 100}; }, std::chrono::seconds(20)));
    ASSERT_EQ(detector.Stop(), 0);
    EXPECT_TRUE(FollowedAcrossOutage(recorder.Reports(), Report{true, 100}, Report{true, 100}));
  }
  {
    cam_.Handle(kPath, OutageHandler({on}, on));
    EventBuf buffer;
    EventRecorder recorder(buffer);
    SONYEID detector(&camera_, 1);
    ASSERT_EQ(detector.Init(&buffer, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.size() > 2 && r.back() == Report{true, 1}; }, std::chrono::seconds(20)));
    ASSERT_EQ(detector.Stop(), 0);
    EXPECT_TRUE(FollowedAcrossOutage(recorder.Reports(), Report{true, 1}, Report{true, 1}));
  }
}

}  // namespace
