// Eight alert-stream detectors in one process at once, each parsing its records (and calling
// libxml2's global clean-up after each) on its own thread while the others parse theirs. Run
// under ThreadSanitizer this shows that the library's use of libxml2 is serialised; in every
// build it shows that no detector's judgement disturbs another's.

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "detectors/hikvision.h"
#include "detectors/psia.h"
#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Report;

const char kHikPath[] = "/Event/notification/alertStream";
const char kPsiaPath[] = "/PSIA/Custom/Event/notification/alertStream";

std::string Alert(const std::string& type, const std::string& state, int count) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\r\n"
         "<EventNotificationAlert version=\"1.0\" xmlns=\"urn:psialliance-org\">\r\n"
         "<activePostCount>" +
         std::to_string(count) +
         "</activePostCount>\r\n"
         "<eventType>" +
         type + "</eventType>\r\n<eventState>" + state +
         "</eventState>\r\n"
         "</EventNotificationAlert>\r\n";
}

// Pushes records without pause: VMD records whose count goes up by one each time, or IO
// records that alternate between active and inactive every four records (so every fourth
// record judged flips), until the client goes.
void PushForever(evsim::HttpConnection& connection, bool motion) {
  evtest::MultipartWriter writer(connection);
  if (!writer.Begin()) return;
  for (int i = 1;; ++i) {
    const std::string record = motion ? Alert("VMD", "active", i)
                                      : Alert("IO", (i / 4) % 2 == 0 ? "active" : "inactive", 1);
    if (!writer.Part("application/xml", record)) return;
    if (i % 64 == 0 && !connection.SleepFor(std::chrono::milliseconds(1))) return;
  }
}

struct Watched {
  std::unique_ptr<DetectorBase> detector;
  bool motion;
  std::unique_ptr<EventBuf> buffer = std::make_unique<EventBuf>();
  std::unique_ptr<EventRecorder> recorder = std::make_unique<EventRecorder>(*buffer);
};

TEST(AlertStreamThreadsTest, EightDetectorsParseAtOnce) {
  // One camera pushes motion records on both paths, the other input records.
  FakeCamera md_cam, eid_cam;
  md_cam.Handle(kHikPath, [](evsim::HttpConnection& c) { PushForever(c, true); });
  md_cam.Handle(kPsiaPath, [](evsim::HttpConnection& c) { PushForever(c, true); });
  eid_cam.Handle(kHikPath, [](evsim::HttpConnection& c) { PushForever(c, false); });
  eid_cam.Handle(kPsiaPath, [](evsim::HttpConnection& c) { PushForever(c, false); });
  Camera md_camera(md_cam.Record());
  Camera eid_camera(eid_cam.Record());

  std::vector<Watched> watched;
  for (int i = 0; i < 2; ++i) {
    watched.push_back(Watched{std::make_unique<HikVisionMD>(&md_camera), true});
    watched.push_back(Watched{std::make_unique<PSIAMD>(&md_camera), true});
    watched.push_back(Watched{std::make_unique<HikVisionEID>(&eid_camera, 1), false});
    watched.push_back(Watched{std::make_unique<PSIAEID>(&eid_camera, 2), false});
  }
  ASSERT_EQ(watched.size(), 8u);
  for (Watched& w : watched) {
    ASSERT_EQ(w.detector->Init(w.buffer.get(), 500), 0);
    ASSERT_EQ(w.detector->Start(), 0);
  }
  const size_t kReports = 1000;
  for (Watched& w : watched) {
    EXPECT_TRUE(w.recorder->WaitForCount(kReports, std::chrono::seconds(60)));
  }
  for (Watched& w : watched) EXPECT_EQ(w.detector->Stop(), 0);

  for (size_t d = 0; d < watched.size(); ++d) {
    std::vector<Report> reports = watched[d].recorder->Reports();
    ASSERT_GE(reports.size(), kReports) << d;
    EXPECT_EQ(reports.back(), (Report{false, 0})) << d;
    reports.pop_back();
    for (size_t i = 0; i < reports.size(); ++i) {
      if (watched[d].motion) {
        // Every judged VMD record carries a new count.
        ASSERT_EQ(reports[i], (Report{true, 100})) << "detector " << d << " report " << i;
      } else {
        // Records judged four apart alternate between active and inactive.
        ASSERT_EQ(reports[i].value, 1) << "detector " << d << " report " << i;
        if (i > 0) {
          ASSERT_NE(reports[i].state, reports[i - 1].state) << "detector " << d << " report " << i;
        }
      }
    }
  }
  EXPECT_EQ(md_cam.Count(kHikPath), 2);
  EXPECT_EQ(md_cam.Count(kPsiaPath), 2);
  EXPECT_EQ(eid_cam.Count(kHikPath), 2);
  EXPECT_EQ(eid_cam.Count(kPsiaPath), 2);
}

}  // namespace
