#include "detectors/storage.h"

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
using evtest::Text;

const char kStatus[] = "/cgi-bin/alarm.cgi?action=status";

class StorageTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  static CameraAPIRecord Api(int port) {
    CameraAPIRecord record;
    record.stream = StreamLocation{kStatus, port};
    return record;
  }
  Reading Motion(const std::string& body) {
    cam_.Answer(kStatus, Text(body));
    StorageMD detector(&camera_, &api_);
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }
  Reading Input(const std::string& body) {
    cam_.Answer(kStatus, Text(body));
    StorageEID detector(&camera_, &api_, 1);
    Reading r{7, true, 0};
    r.result = detector.DoEID(r.state);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "admin")};
  CameraAPI api_{Api(cam_.Port())};
};

TEST_F(StorageTest, SemicolonAfterTheValueIsDroppedAndOneMeansMotion) {
  Reading m = Motion("disk_status=ok;\nalarm_status=1;\n");
  EXPECT_EQ(m.result, 0);
  EXPECT_TRUE(m.state);
  EXPECT_EQ(m.level, 100u);
  Reading i = Input("disk_status=ok;\nalarm_status=1;\n");
  EXPECT_EQ(i.result, 0);
  EXPECT_FALSE(i.state);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus, kStatus}));
}

TEST_F(StorageTest, TwoMeansInputAndThreeBoth) {
  Reading m = Motion("alarm_status=2;\n");
  EXPECT_EQ(m.result, 0);
  EXPECT_FALSE(m.state);
  EXPECT_EQ(m.level, 0u);
  EXPECT_TRUE(Input("alarm_status=2;\n").state);
  EXPECT_TRUE(Motion("alarm_status=3;\n").state);
  EXPECT_TRUE(Input("alarm_status=3;\n").state);
  for (const char* value : {"0;", "4;", "x;"}) {
    EXPECT_FALSE(Motion(std::string("alarm_status=") + value + "\n").state) << value;
    EXPECT_FALSE(Input(std::string("alarm_status=") + value + "\n").state) << value;
  }
}

TEST_F(StorageTest, OnlyTheFirstSemicolonIsRemoved) {
  // ";1" becomes "1"; ";;2" becomes ";2", which is not a number.
  EXPECT_TRUE(Motion("alarm_status=;1\n").state);
  Reading r = Input("alarm_status=;;2\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  // "1;2" becomes "12", neither motion nor input.
  EXPECT_FALSE(Motion("alarm_status=1;2\n").state);
  EXPECT_TRUE(Motion("alarm_status=1\n").state) << "a value without \";\" is read as it is";
}

TEST_F(StorageTest, TheOtherModulesKeyIsNotRead) {
  EXPECT_EQ(Motion("Alarm.Status=1\n").result, -1);
  EXPECT_EQ(Input("Alarm.Status=2\n").result, -1);
}

TEST_F(StorageTest, KeyBeyondTheFirst8192BytesIsNotFound) {
  const std::string filler(8191, '#');
  EXPECT_EQ(Motion(filler + "\nalarm_status=1;\n").result, -1);
  EXPECT_EQ(Motion("alarm_status=1;\n" + filler).result, 0);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kStatus, kStatus}));
}

TEST_F(StorageTest, LoopsReportTheSwappedBits) {
  cam_.Answer(kStatus, Text("alarm_status=2;\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  StorageEID eid(&camera_, &api_, 0);
  StorageMD md(&camera_, &api_);
  ASSERT_EQ(eid.Init(&buffer, 10), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  ASSERT_EQ(eid.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{true, 1}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));

  cam_.Answer(kStatus, Text("alarm_status=1;\n"));
  EventBuf motion_buffer;
  EventRecorder motion(motion_buffer);
  ASSERT_EQ(md.Init(&motion_buffer, 10), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(motion.WaitForCount(3));
  ASSERT_EQ(md.Stop(), 0);
  reports = motion.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_GE(cam_.Count(kStatus), 4);
}

TEST_F(StorageTest, InputLoopWithoutCameraReportsNothing) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  StorageEID eid(nullptr, &api_, 1);
  ASSERT_EQ(eid.Init(&buffer, 10), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_EQ(eid.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

}  // namespace
