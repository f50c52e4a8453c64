#include "detectors/compro.h"

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

const char kList[] = "/cgi-bin/view/list_param.cgi?Action=List&Group=MotionDetect";

class ComproTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body, const std::string& type = "text/plain") {
    cam_.Answer(kList, Respond(200, type, body));
    COMPROMD detector(&camera_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "secret")};
};

TEST_F(ComproTest, RegionZeroOnTheFirstLineIsMotion) {
  Reading r = Motion("Region:0\r\nEnable:1\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kList}));
}

TEST_F(ComproTest, PrefixIgnoresCase) {
  EXPECT_TRUE(Motion("REGION:0\r\n").state);
  EXPECT_TRUE(Motion("region:012\r\n").state);
}

TEST_F(ComproTest, OtherFirstLineIsNoMotion) {
  for (const char* body :
       {"Region:1\r\n", "Region:none\r\n", "Region: 0\r\n", "\r\nRegion:0\r\n"}) {
    Reading r = Motion(body);
    EXPECT_EQ(r.result, 0) << body;
    EXPECT_FALSE(r.state) << body;
    EXPECT_EQ(r.level, 0u) << body;
  }
}

TEST_F(ComproTest, OnlyTheFirstLineIsLookedAt) {
  Reading r = Motion("Enable:1\r\nRegion:0\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(ComproTest, AnyMediaTypeButAMissingOneFails) {
  EXPECT_TRUE(Motion("Region:0\r\n", "application/x-params").state);
  Reading r = Motion("Region:0\r\n", "");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(ComproTest, EmptyBodyFails) {
  EXPECT_EQ(Motion("").result, -1);
}

TEST_F(ComproTest, HttpErrorAndNullCameraFail) {
  cam_.Answer(kList, Respond(404, "text/plain", "Region:0\r\n"));
  COMPROMD detector(&camera_);
  bool state = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  COMPROMD none(nullptr);
  EXPECT_EQ(none.DoMD(state, level), -1);
}

TEST_F(ComproTest, NullCameraLoopReportsNothing) {
  COMPROMD detector(nullptr);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST_F(ComproTest, LoopReportsMotionAndFailureThenFinalFalse) {
  cam_.Answer(kList, Text("Region:0\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  COMPROMD detector(&camera_);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  cam_.Answer(kList, Respond(500, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().front(), (Report{true, 100}));
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kList);
}

}  // namespace
