#include "detectors/arecont.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;
using evtest::Respond;
using evtest::Text;

const char kMd[] = "/motion?mdresult";

class ArecontTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  // The camera's answer: its lines, then the empty line that ends a key/value answer.
  Reading Motion(const std::string& lines) {
    cam_.Answer(kMd, Text(lines + "\r\n"));
    ARECONTMD detector(&camera_, &api_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "")};
  // A relative path, and a port that is not the camera's: only the path is used.
  CameraAPI api_{evtest::ApiStreamAt("motion?mdresult", 1)};
};

TEST_F(ArecontTest, ValuesContainingNoMeanNoMotion) {
  for (const char* value : {"no", "none", "nomotion", "xnoy", "'no'"}) {
    Reading r = Motion(std::string("mdresult=") + value + "\r\n");
    EXPECT_EQ(r.result, 0) << value;
    EXPECT_FALSE(r.state) << value;
    EXPECT_EQ(r.level, 0u) << value;
  }
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(5, kMd)));
}

TEST_F(ArecontTest, OtherValuesMeanMotion) {
  for (const char* value : {"1", "yes", "NO", "n o", "on"}) {
    Reading r = Motion(std::string("mdresult=") + value + "\r\n");
    EXPECT_EQ(r.result, 0) << value;
    EXPECT_TRUE(r.state) << value;
    EXPECT_EQ(r.level, 100u) << value;
  }
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(5, kMd)));
}

TEST_F(ArecontTest, EmptyValueMeansMotion) {
  ARECONTMD detector(&camera_, &api_);
  unsigned int level = 0;
  EXPECT_EQ(detector.IsMotionDetected("", level), 1);
  EXPECT_EQ(level, 100u);
  EXPECT_EQ(detector.IsMotionDetected("none", level), 0);
  EXPECT_EQ(level, 0u);
  // An answer read whole without the key leaves the value empty: motion.
  Reading r = Motion("other=no\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kMd}));
}

TEST_F(ArecontTest, LastMdresultLineWins) {
  EXPECT_FALSE(Motion("mdresult=1\r\nmdresult=no\r\n").state);
  EXPECT_TRUE(Motion("mdresult=no\r\nmdresult=1\r\n").state);
}

TEST_F(ArecontTest, FailedQueriesFail) {
  // The key/value helper needs an empty line or ten lines before the body ends.
  cam_.Answer(kMd, Text("mdresult=no\r\n"));
  ARECONTMD detector(&camera_, &api_);
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  cam_.Answer(kMd, Respond(404, "text/plain", "mdresult=no\r\n\r\n"));
  EXPECT_EQ(detector.DoMD(state, level), -1);
  cam_.Answer(kMd, Respond(200, "application/json", "mdresult=no\r\n\r\n"));
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(3, kMd)));
}

TEST_F(ArecontTest, NullCameraOrApiFails) {
  ARECONTMD no_camera(nullptr, &api_);
  ARECONTMD no_api(&camera_, nullptr);
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(no_camera.DoMD(state, level), -1);
  EXPECT_EQ(no_api.DoMD(state, level), -1);
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(ArecontTest, AFailedCycleReportsFalseZeroForThatCycleOnly) {
  cam_.AnswerSequence(kMd, {Text("mdresult=1\r\n\r\n"), Respond(500, "text/plain", ""),
                            Text("mdresult=1\r\n\r\n")});
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ARECONTMD detector(&camera_, &api_);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);  // the loop keeps its one-second pace
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kMd)) + 1);
}

TEST_F(ArecontTest, LoopWithoutCameraReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ARECONTMD detector(nullptr, &api_);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST_F(ArecontTest, LoopWithoutApiReportsFailures) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ARECONTMD detector(&camera_, nullptr);
  ASSERT_EQ(detector.Init(&buffer, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(1));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
  EXPECT_GE(recorder.Size(), 2u);
  EXPECT_TRUE(cam_.Targets().empty());
}

}  // namespace
