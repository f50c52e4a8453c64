#include "detectors/sanyo.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::Binary;
using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;
using evtest::Respond;

// The status path as the camera's API gives it (relative), and as the camera sees it.
const char kApiPath[] = "cgi-bin/camstatus.cgi?format=bin";
const char kStatus[] = "/cgi-bin/camstatus.cgi?format=bin";

// A 48-byte status record with the input byte (33) and the motion byte (34) set; every
// other byte holds a marker that no test reads as a state.
std::string Record(unsigned char inputs, unsigned char motion) {
  std::string record(48, static_cast<char>(0xFF));
  record[33] = static_cast<char>(inputs);
  record[34] = static_cast<char>(motion);
  return record;
}

CameraAPIRecord ApiWithStream(const std::string& path, int port) {
  CameraAPIRecord api;
  api.api = "sanyo";
  api.stream = StreamLocation{path, port};
  return api;
}

class SanyoTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& body,
                 const std::string& type = "application/octet-stream") {
    cam_.Answer(kStatus, Respond(200, type, body));
    SanyoMD detector(&camera_, &api_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Inputs(const std::string& body, int inputs) {
    cam_.Answer(kStatus, Binary(body));
    SanyoEID detector(&camera_, &api_, inputs);
    Reading r{7, true, 77};
    r.result = detector.DoEID(r.state, r.level);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "secret")};
  // The API's port is not the camera's: the request still goes to the camera's own port.
  CameraAPI api_{ApiWithStream(kApiPath, 1)};
};

TEST_F(SanyoTest, MotionBitGivesLevel100) {
  Reading r = Motion(Record(0x00, 0x02));
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus}));
}

TEST_F(SanyoTest, OtherMotionBitsAreNoMotion) {
  Reading r = Motion(Record(0xFF, 0x01));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_FALSE(Motion(Record(0x02, 0xFD)).state) << "byte 33 is not the motion byte";
  EXPECT_TRUE(Motion(Record(0x00, 0xFF)).state);
}

TEST_F(SanyoTest, MotionTestOfOneByte) {
  SanyoMD detector(&camera_, &api_);
  unsigned int level = 7;
  EXPECT_TRUE(detector.IsMotionDetected(0x02, level));
  EXPECT_EQ(level, 100u);
  EXPECT_FALSE(detector.IsMotionDetected(0x01, level));
  EXPECT_EQ(level, 0u);
  EXPECT_TRUE(detector.IsMotionDetected(static_cast<char>(0x82), level));
}

TEST_F(SanyoTest, FirstWatchedInputBitMakesItActiveWithLevel100) {
  Reading r = Inputs(Record(0x02, 0x00), 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus}));
}

TEST_F(SanyoTest, InputBitsBeyondTheInputCountAreNotWatched) {
  Reading r = Inputs(Record(0x04, 0x02), 2);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_TRUE(Inputs(Record(0x80, 0x00), 8).state);
}

TEST_F(SanyoTest, NoInputsIsNeverActive) {
  for (int inputs : {0, -1}) {
    Reading r = Inputs(Record(0xFF, 0xFF), inputs);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.state) << inputs;
    EXPECT_EQ(r.level, 0u) << inputs;
  }
}

TEST_F(SanyoTest, InputTestOfOneByte) {
  SanyoEID detector(&camera_, &api_, 3);
  unsigned int level = 7;
  EXPECT_TRUE(detector.IsEventDetected(0x04, level));
  EXPECT_EQ(level, 100u);
  EXPECT_FALSE(detector.IsEventDetected(0x08, level));
  EXPECT_EQ(level, 0u);
  SanyoEID many(&camera_, &api_, 40);
  EXPECT_TRUE(many.IsEventDetected(static_cast<char>(0x80), level));
  EXPECT_FALSE(many.IsEventDetected(0x00, level));
}

TEST_F(SanyoTest, ShortRecordFails) {
  Reading r = Motion(Record(0x00, 0x02).substr(0, 47));
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  r = Inputs(Record(0x01, 0x00).substr(0, 40), 1);
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
}

TEST_F(SanyoTest, OnlyOctetStreamIsAccepted) {
  EXPECT_EQ(Motion(Record(0x00, 0x02), "text/plain").result, -1);
  EXPECT_EQ(Motion(Record(0x00, 0x02), "").result, -1);
  EXPECT_TRUE(Motion(Record(0x00, 0x02), "APPLICATION/OCTET-STREAM").state);
}

TEST_F(SanyoTest, MissingCameraOrApiFailsWithoutARequest) {
  bool state = true;
  unsigned int level = 7;
  SanyoMD noCamera(nullptr, &api_);
  EXPECT_EQ(noCamera.DoMD(state, level), -1);
  SanyoMD noApi(&camera_, nullptr);
  EXPECT_EQ(noApi.DoMD(state, level), -1);
  SanyoEID noCameraEid(nullptr, &api_, 1);
  EXPECT_EQ(noCameraEid.DoEID(state, level), -1);
  SanyoEID noApiEid(&camera_, nullptr, 1);
  EXPECT_EQ(noApiEid.DoEID(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(SanyoTest, FailingStreamPathFailsThePollWithoutARequest) {
  CameraAPI none{CameraAPIRecord{}};
  SanyoMD md(&camera_, &none);
  SanyoEID eid(&camera_, &none, 1);
  bool state = true;
  unsigned int level = 7;
  EXPECT_EQ(md.DoMD(state, level), -1);
  EXPECT_EQ(eid.DoEID(state, level), -1);
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(SanyoTest, PathWithLeadingSlashFromTheApiIsUsedAsItStands) {
  CameraAPI absolute{ApiWithStream(kStatus, 80)};
  cam_.Answer(kStatus, Binary(Record(0x00, 0x02)));
  SanyoMD detector(&camera_, &absolute);
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(detector.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus}));
}

TEST_F(SanyoTest, MotionLoopWithNullCameraReportsNothing) {
  SanyoMD detector(nullptr, &api_);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST_F(SanyoTest, InputLoopWithNullCameraReportsFailedReadings) {
  SanyoEID detector(nullptr, &api_, 1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(1));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

TEST_F(SanyoTest, MotionLoopReportsLevelsAndFinalFalse) {
  cam_.Answer(kStatus, Binary(Record(0x00, 0x02)));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  SanyoMD detector(&camera_, &api_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  cam_.Answer(kStatus, Binary("short"));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Reports().front(), (Report{true, 100}));
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  for (const std::string& target : cam_.Targets()) EXPECT_EQ(target, kStatus);
}

TEST_F(SanyoTest, InputLoopReportsALevelLikeAMotionDetector) {
  cam_.Answer(kStatus, Binary(Record(0x01, 0x00)));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  SanyoEID detector(&camera_, &api_, 1);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  cam_.Answer(kStatus, Binary(Record(0x00, 0x00)));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 0}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  for (const Report& r : reports) EXPECT_NE(r.value, 1) << "no validity flag";
}

}  // namespace
