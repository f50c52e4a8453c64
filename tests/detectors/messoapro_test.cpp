#include "detectors/messoapro.h"

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

const char kStatus[] = "/cgi-bin/status.cgi?group=Alarm";

class MessoaProTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body) {
    cam_.Answer(kStatus, Text(body));
    MessoaProMD detector(&camera_, &api_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Input(const std::string& body) {
    cam_.Answer(kStatus, Text(body));
    MessoaProEID detector(&camera_, &api_, 1);
    Reading r{7, true, 0};
    r.result = detector.DoEID(r.state);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "1234")};
  // The path as the model's API gives it, relative.
  CameraAPI api_{evtest::ApiStreamAt("cgi-bin/status.cgi?group=Alarm", cam_.Port())};
};

TEST_F(MessoaProTest, ThreeMeansMotionAndInput) {
  Reading m = Motion("Alarm.Enable=1\nAlarm.Status=3\nAlarm.Output=0\n");
  EXPECT_EQ(m.result, 0);
  EXPECT_TRUE(m.state);
  EXPECT_EQ(m.level, 100u);
  Reading i = Input("Alarm.Enable=1\nAlarm.Status=3\nAlarm.Output=0\n");
  EXPECT_EQ(i.result, 0);
  EXPECT_TRUE(i.state);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus, kStatus}));
}

TEST_F(MessoaProTest, OneMeansInputOnly) {
  Reading m = Motion("Alarm.Status=1\n");
  EXPECT_EQ(m.result, 0);
  EXPECT_FALSE(m.state);
  EXPECT_EQ(m.level, 0u);
  Reading i = Input("Alarm.Status=1\n");
  EXPECT_EQ(i.result, 0);
  EXPECT_TRUE(i.state);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus, kStatus}));
}

TEST_F(MessoaProTest, TwoMeansMotionOnly) {
  EXPECT_TRUE(Motion("Alarm.Status=2\r\n").state);
  Reading i = Input("Alarm.Status=2\r\n");
  EXPECT_EQ(i.result, 0);
  EXPECT_FALSE(i.state);
}

TEST_F(MessoaProTest, FourZeroAndNonNumbersMeanNeither) {
  for (const char* value : {"4", "0", "7", "abc", ""}) {
    const std::string body = std::string("Alarm.Status=") + value + "\n";
    Reading m = Motion(body);
    EXPECT_EQ(m.result, 0) << value;
    EXPECT_FALSE(m.state) << value;
    EXPECT_EQ(m.level, 0u) << value;
    Reading i = Input(body);
    EXPECT_EQ(i.result, 0) << value;
    EXPECT_FALSE(i.state) << value;
  }
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(10, kStatus)));
}

TEST_F(MessoaProTest, KeyIsMatchedWholeAndWithItsCase) {
  Reading m = Motion("alarm.status=3\nAlarm.StatusX=3\n");
  EXPECT_EQ(m.result, -1);
  EXPECT_FALSE(m.state);
  EXPECT_EQ(Motion("x=1\n  Alarm.Status = 2 \r\n").level, 100u);
}

TEST_F(MessoaProTest, MissingKeyFails) {
  Reading m = Motion("Alarm.Enable=1\n");
  EXPECT_EQ(m.result, -1);
  EXPECT_FALSE(m.state);
  EXPECT_EQ(m.level, 0u);
  EXPECT_EQ(Input("Alarm.Enable=1\n").result, -1);
}

TEST_F(MessoaProTest, KeyBeyondTheFirst8192BytesIsNotFound) {
  const std::string filler(8192 - 1, 'x');
  // 8191 bytes and a line feed fill the single read exactly.
  EXPECT_EQ(Motion(filler + "\nAlarm.Status=2\n").result, -1);
  EXPECT_EQ(Input(filler + "\nAlarm.Status=1\n").result, -1);
  // The same key within the first 8192 bytes is found.
  Reading r = Motion(filler.substr(0, 8100) + "\nAlarm.Status=2\n" + filler);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>(3, kStatus))) << "one request each";
}

TEST_F(MessoaProTest, FailedRequestsAndEmptyAnswersFail) {
  cam_.Answer(kStatus, Respond(404, "text/plain", "Alarm.Status=3\n"));
  MessoaProMD detector(&camera_, &api_);
  bool state = true;
  unsigned int level = 5;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  EXPECT_EQ(Motion("").result, -1);
}

TEST_F(MessoaProTest, AnyContentTypeIsRead) {
  cam_.Answer(kStatus, Respond(200, "application/octet-stream", "Alarm.Status=2\n"));
  MessoaProMD detector(&camera_, &api_);
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(detector.DoMD(state, level), 0);
  EXPECT_TRUE(state);
}

TEST_F(MessoaProTest, PathAndPortComeFromTheApi) {
  FakeCamera other;
  other.Answer("/alarm", Text("Alarm.Status=2\n"));
  CameraAPI api(evtest::ApiStreamAt("/alarm", other.Port()));
  MessoaProMD detector(&camera_, &api);
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(detector.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(other.Targets(), (std::vector<std::string>{"/alarm"}));
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(MessoaProTest, NullCameraOrApiFails) {
  MessoaProMD no_camera(nullptr, &api_);
  MessoaProMD no_api(&camera_, nullptr);
  bool state = true;
  unsigned int level = 5;
  EXPECT_EQ(no_camera.DoMD(state, level), -1);
  EXPECT_EQ(no_api.DoMD(state, level), -1);
  MessoaProEID no_api_input(&camera_, nullptr, 1);
  EXPECT_EQ(no_api_input.DoEID(state), -1);
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(MessoaProTest, LoopsReportEveryReadingAtTheBoundInterval) {
  cam_.AnswerSequence(kStatus, {Text("Alarm.Status=3\n"), Respond(500, "text/plain", ""), Text("Alarm.Status=0\n")});
  EventBuf motion_buffer;
  EventRecorder motion(motion_buffer);
  MessoaProMD md(&camera_, &api_);
  ASSERT_EQ(md.Init(&motion_buffer, 10), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(motion.WaitForCount(4));
  ASSERT_EQ(md.Stop(), 0);
  std::vector<Report> reports = motion.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kStatus)) + 1);

  cam_.AnswerSequence(kStatus, {Text("Alarm.Status=3\n"), Respond(500, "text/plain", ""), Text("Alarm.Status=0\n")});
  cam_.ClearLog();
  EventBuf input_buffer;
  EventRecorder input(input_buffer);
  MessoaProEID eid(&camera_, &api_, 4);
  ASSERT_EQ(eid.Init(&input_buffer, 10), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_TRUE(input.WaitForCount(4));
  ASSERT_EQ(eid.Stop(), 0);
  reports = input.Reports();
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 0})) << "a failure is not a valid reading";
  EXPECT_EQ(reports[2], (Report{false, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(reports.size(), static_cast<size_t>(cam_.Count(kStatus)) + 1);
}

TEST_F(MessoaProTest, InputLoopWithoutCameraReportsNothingWhileMotionLoopFails) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  MessoaProEID eid(nullptr, &api_, 1);
  ASSERT_EQ(eid.Init(&buffer, 10), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_EQ(eid.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);

  MessoaProMD md(nullptr, &api_);
  ASSERT_EQ(md.Init(&buffer, 10), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(md.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

}  // namespace
