// PSIAMD and PSIAEID: the HikVision machines on the PSIA alert-stream path.

#include "detectors/psia.h"

#include <gtest/gtest.h>

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
using evtest::Push;
using evtest::PushHandler;
using evtest::Report;

const char kPath[] = "/PSIA/Custom/Event/notification/alertStream";

std::string Alert(const std::string& type, const std::string& state, int count) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\r\n"
         "<EventNotificationAlert version=\"1.0\" xmlns=\"urn:psialliance-org\">\r\n"
         "<ipAddress>10.0.0.8</ipAddress>\r\n<protocol>HTTP</protocol>\r\n"
         "<activePostCount>" +
         std::to_string(count) +
         "</activePostCount>\r\n"
         "<eventType>" +
         type + "</eventType>\r\n<eventState>" + state +
         "</eventState>\r\n"
         "<eventDescription>alarm</eventDescription>\r\n</EventNotificationAlert>\r\n";
}

class PSIATest : public ::testing::Test {
 protected:
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
  void Push(std::vector<std::string> parts) {
    cam_.Handle(kPath,
                PushHandler({evtest::Push{std::move(parts), evtest::Push::kRepeatLast,
                                          std::chrono::milliseconds(2), "application/xml"}}));
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(PSIATest, MotionFromThePsiaPathCounts005) {
  Push({Alert("VMD", "active", 0), Alert("VMD", "active", 0), Alert("VMD", "active", 5)});
  PSIAMD md(&camera_);
  std::vector<Report> reports = RunUntil(md, 3);
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{false, 0}));
  EXPECT_EQ(reports[1], (Report{true, 100}));
  EXPECT_EQ(reports[2], (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

TEST_F(PSIATest, InputsFromThePsiaPathWhateverTheInputNumber) {
  Push({Alert("IO", "inactive", 1), Alert("VMD", "active", 1), Alert("VMD", "active", 1),
        Alert("VMD", "active", 1), Alert("IO", "Active", 1), Alert("VMD", "active", 1),
        Alert("VMD", "active", 1), Alert("VMD", "active", 1), Alert("IO", "active", 1)});
  PSIAEID eid(&camera_, 4);
  std::vector<Report> reports = RunUntil(eid, 2);
  ASSERT_GE(reports.size(), 2u);
  EXPECT_EQ(reports[0], (Report{false, 1}));  // part 5: "Active"
  EXPECT_EQ(reports[1], (Report{true, 1}));   // part 9
  EXPECT_EQ(cam_.Count("/Event/notification/alertStream"), 0);
}

TEST_F(PSIATest, DirectJudgementIsTheHikVisionOne) {
  PSIAMD md(&camera_);
  std::string vmd = Alert("VMD", "active", 5);
  EXPECT_EQ(md.IsMotionDetected(&vmd[0], static_cast<int>(vmd.size())), 3);
  EXPECT_EQ(md.IsMotionDetected(&vmd[0], static_cast<int>(vmd.size())), 2);
  PSIAEID eid(&camera_, 1);
  std::string io = Alert("IO", "active", 1);
  EXPECT_EQ(eid.IsEventDetected(&io[0], static_cast<int>(io.size())), 3);
}

TEST_F(PSIATest, WithoutCameraTheLoopEndsAtOnceReportingNothing) {
  PSIAMD md(nullptr);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(md.Init(&buffer, 500), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_EQ(md.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

}  // namespace
