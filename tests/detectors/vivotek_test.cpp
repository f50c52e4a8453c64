#include "detectors/vivotek.h"

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

const std::string kFromOne = "/cgi-bin/getdi.cgi?di";
const std::string kFromZero = "/cgi-bin/dido/getdi.cgi?di";

class VivotekEIDTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool active;
  };
  Reading Read(int group, int inputs, bool preset = false) {
    VivotekEID detector(&camera_, static_cast<VIVO_FUNC_GR>(group), inputs);
    Reading r{7, preset};
    r.result = detector.DoEID(r.active);
    return r;
  }
  // Runs the loop until it has reported `count` passes, then stops it.
  std::vector<Report> Run(int group, int inputs, size_t count) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    VivotekEID detector(&camera_, static_cast<VIVO_FUNC_GR>(group), inputs);
    EXPECT_EQ(detector.Init(&buffer, 20), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitForCount(count));
    EXPECT_EQ(detector.Stop(), 0);
    return recorder.Reports();
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("root", "secret")};
};

TEST_F(VivotekEIDTest, GroupZeroAsksFromInputOneWithKeyDIAndValueH) {
  cam_.Answer(kFromOne + "1", Text("DI1=L\r\n"));
  cam_.Answer(kFromOne + "2", Text("DI2=H\r\n"));
  Reading r = Read(0, 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromOne + "1", kFromOne + "2"}));
}

TEST_F(VivotekEIDTest, GroupOneAsksAsGroupZero) {
  cam_.Answer(kFromOne + "1", Text("DI1=L\r\n"));
  cam_.Answer(kFromOne + "2", Text("DI2=L\r\n"));
  Reading r = Read(1, 2, true);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromOne + "1", kFromOne + "2"}));
}

TEST_F(VivotekEIDTest, TheKeyCarriesTheInputsNumber) {
  // Input 1's answer about input 2 is not input 1's state.
  cam_.Answer(kFromOne + "1", Text("DI2=H\r\n"));
  EXPECT_FALSE(Read(0, 1).active);
  cam_.Answer(kFromZero + "0", Text("di1=1\r\n"));
  EXPECT_FALSE(Read(2, 1).active);
  // Each group reads its own value: "1" is not high, "H" is not 1.
  cam_.Answer(kFromOne + "1", Text("DI1=1\r\n"));
  EXPECT_FALSE(Read(0, 1).active);
  cam_.Answer(kFromZero + "0", Text("di0=H\r\n"));
  EXPECT_FALSE(Read(2, 1).active);
}

TEST_F(VivotekEIDTest, GroupTwoAsksFromInputZeroWithKeyDiAndValueOne) {
  cam_.Answer(kFromZero + "0", Text("di0=0\r\n"));
  cam_.Answer(kFromZero + "1", Text("di1=1\r\n"));
  Reading r = Read(2, 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromZero + "0", kFromZero + "1"}));
}

TEST_F(VivotekEIDTest, GroupThreeAsksAsGroupTwo) {
  cam_.Answer(kFromZero + "0", Text("di0=0\r\n"));
  cam_.Answer(kFromZero + "1", Text("di1=0\r\n"));
  Reading r = Read(3, 2, true);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromZero + "0", kFromZero + "1"}));
}

TEST_F(VivotekEIDTest, FirstActiveInputEndsThePass) {
  cam_.Answer(kFromOne + "1", Text("DI1=H\r\n"));
  cam_.Answer(kFromOne + "2", Text("DI2=H\r\n"));
  EXPECT_TRUE(Read(0, 3).active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromOne + "1"}));
  cam_.ClearLog();
  cam_.Answer(kFromZero + "0", Text("di0=1\r\n"));
  EXPECT_TRUE(Read(2, 3).active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromZero + "0"}));
}

TEST_F(VivotekEIDTest, FailedRequestCountsAsInactiveAndTheNextInputIsAsked) {
  cam_.Answer(kFromOne + "1", Respond(500, "text/plain", "DI1=H\r\n"));
  cam_.Answer(kFromOne + "2", Text("DI2=H\r\n"));
  Reading r = Read(0, 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.active);
  EXPECT_EQ(cam_.Targets(), (Targets{kFromOne + "1", kFromOne + "2"}));
}

TEST_F(VivotekEIDTest, InputCountBelowOneAsksNothingAndLeavesTheFlag) {
  for (int inputs : {0, -1, -7}) {
    Reading r = Read(0, inputs, true);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_TRUE(r.active) << inputs;
    r = Read(2, inputs, false);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.active) << inputs;
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(VivotekEIDTest, UnknownGroupFailsEveryPassWithoutAsking) {
  for (int group : {4, -1, 100}) {
    Reading r = Read(group, 2, true);
    EXPECT_EQ(r.result, -1) << group;
    EXPECT_FALSE(r.active) << group;
  }
  std::vector<Report> reports = Run(4, 2, 3);
  ASSERT_GE(reports.size(), 3u);
  for (const Report& report : reports) EXPECT_EQ(report, (Report{false, 0}));
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(VivotekEIDTest, LoopReportsStateWithValidityAndFinalFalse) {
  cam_.Answer(kFromOne + "1", Text("DI1=H\r\n"));
  std::vector<Report> reports = Run(0, 1, 2);
  ASSERT_GE(reports.size(), 3u);
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{true, 1})) << i;
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  // One request per pass, all for input 1.
  EXPECT_EQ(static_cast<size_t>(cam_.Count(kFromOne + "1")), cam_.Targets().size());
  EXPECT_GE(cam_.Targets().size(), reports.size() - 1);
}

TEST_F(VivotekEIDTest, UnreachableCameraIsAValidInactiveReading) {
  CameraRecord record = cam_.Record();
  record.port = 1;  // nothing listens there
  Camera nowhere(record);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  VivotekEID detector(&nowhere, static_cast<VIVO_FUNC_GR>(2), 2);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{false, 1})) << i;
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST_F(VivotekEIDTest, NullCameraReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  VivotekEID detector(nullptr, static_cast<VIVO_FUNC_GR>(0), 2);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

}  // namespace
