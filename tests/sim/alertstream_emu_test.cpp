// The HikVision and PSIA emulations: the records of their alert streams, read part by part,
// and the detectors reading them.

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "detectors/hikvision.h"
#include "detectors/psia.h"
#include "framework/host/camera.h"
#include "framework/host/fetcher.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

// The text of element `name` in a record ("" when absent).
std::string Element(const std::string& record, const std::string& name) {
  const std::string open = "<" + name + ">";
  const size_t begin = record.find(open);
  if (begin == std::string::npos) return "";
  const size_t end = record.find("</" + name + ">", begin);
  return record.substr(begin + open.size(), end - begin - open.size());
}

struct Case {
  std::string key;
  std::string path;
  std::string ns;
};

class AlertStreamEmulationTest : public ::testing::TestWithParam<Case> {
 protected:
  void SetUp() override {
    SimOptions options;
    options.emulations = {GetParam().key};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
    fetch_ = std::make_unique<MultipartFetch>("127.0.0.1", cam_->port, GetParam().path.c_str(), "",
                                              "", 10);
  }
  // The next record of the stream; "" when the read failed.
  std::string Next() {
    int length = 0;
    char header[128];
    if (fetch_->ReadPartHeader(&length, header, sizeof(header)) != 0) return "";
    std::string body(static_cast<size_t>(length), '\0');
    if (fetch_->ReadPartBody(&body[0], length) != 0) return "";
    return body;
  }
  Camera MakeCamera() {
    CameraRecord r;
    r.host = "127.0.0.1";
    r.port = cam_->port;
    return Camera(r);
  }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  std::unique_ptr<MultipartFetch> fetch_;
};

TEST_P(AlertStreamEmulationTest, CycleIsFourMotionFourInputAndOneHeartbeatRecord) {
  cam_->state->SetMotion(40);
  std::vector<std::string> types;
  for (int i = 0; i < 18; ++i) {
    const std::string record = Next();
    ASSERT_FALSE(record.empty()) << i;
    EXPECT_NE(
        record.find("<EventNotificationAlert version=\"1.0\" xmlns=\"" + GetParam().ns + "\">"),
        std::string::npos)
        << record;
    types.push_back(Element(record, "eventType"));
  }
  const std::vector<std::string> cycle = {"VMD", "VMD", "VMD", "VMD",      "IO",
                                          "IO",  "IO",  "IO",  "videoloss"};
  for (size_t i = 0; i < types.size(); ++i) EXPECT_EQ(types[i], cycle[i % cycle.size()]) << i;
}

TEST_P(AlertStreamEmulationTest, PostCountRisesOnlyWhileThereIsMotion) {
  cam_->state->SetMotion(40);
  std::vector<std::string> counts, states;
  for (int i = 0; i < 4; ++i) {
    const std::string record = Next();
    counts.push_back(Element(record, "activePostCount"));
    states.push_back(Element(record, "eventState"));
  }
  EXPECT_EQ(counts, (std::vector<std::string>{"1", "2", "3", "4"}));
  EXPECT_EQ(states, (std::vector<std::string>{"active", "active", "active", "active"}));
  cam_->state->SetMotion(0);
  for (int i = 0; i < 5; ++i) Next();  // the inputs and the heartbeat
  for (int i = 0; i < 4; ++i) {
    const std::string record = Next();
    EXPECT_EQ(Element(record, "activePostCount"), "4");
    EXPECT_EQ(Element(record, "eventState"), "inactive");
  }
}

TEST_P(AlertStreamEmulationTest, InputRecordsNameTheActiveInputs) {
  for (int i = 0; i < 4; ++i) Next();
  std::vector<std::string> ports, states;
  for (int i = 0; i < 4; ++i) {
    const std::string record = Next();
    ports.push_back(Element(record, "inputIOPortID"));
    states.push_back(Element(record, "eventState"));
  }
  EXPECT_EQ(ports, (std::vector<std::string>{"1", "2", "3", "4"}));
  EXPECT_EQ(states, (std::vector<std::string>{"inactive", "inactive", "inactive", "inactive"}));
  const std::string heartbeat = Next();
  EXPECT_EQ(Element(heartbeat, "eventState"), "inactive");

  cam_->state->SetInput(2, true);
  cam_->state->SetInput(5, true);
  for (int i = 0; i < 4; ++i) Next();
  ports.clear();
  for (int i = 0; i < 4; ++i) {
    const std::string record = Next();
    ports.push_back(Element(record, "inputIOPortID"));
    EXPECT_EQ(Element(record, "eventState"), "active");
  }
  EXPECT_EQ(ports, (std::vector<std::string>{"2", "5", "2", "5"}));
}

TEST_P(AlertStreamEmulationTest, SilentCameraEndsItsStream) {
  ASSERT_FALSE(Next().empty());
  cam_->state->SetSilent(true);
  bool ended = false;
  for (int i = 0; i < 3 && !ended; ++i) ended = Next().empty();
  EXPECT_TRUE(ended);
}

TEST_P(AlertStreamEmulationTest, OtherPathsAreNotFound) {
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/Event/notification/other"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 404", 0), 0u) << raw;
}

TEST_P(AlertStreamEmulationTest, DetectorsFollowTheState) {
  cam_->state->SetMotion(100);
  cam_->state->SetInput(1, true);
  Camera camera = MakeCamera();
  std::unique_ptr<HikVisionMD> md;
  std::unique_ptr<HikVisionEID> eid;
  if (GetParam().key == "psia") {
    md = std::make_unique<PSIAMD>(&camera);
    eid = std::make_unique<PSIAEID>(&camera, 1);
  } else {
    md = std::make_unique<HikVisionMD>(&camera);
    eid = std::make_unique<HikVisionEID>(&camera, 1);
  }
  // The stream begins VMD 1..4, IO x4, heartbeat, VMD 5..8.
  bool motion = false, active = false;
  unsigned int level = 0;
  md->SetPartCounter(1);
  EXPECT_EQ(md->DoMD(fetch_.get(), motion, level), 3);  // VMD 1
  for (int i = 0; i < 3; ++i) Next();                   // VMD 2..4
  EXPECT_EQ(eid->DoEID(fetch_.get(), active), 3);       // IO, input 1 active
  EXPECT_TRUE(active);
  for (int i = 0; i < 4; ++i) Next();                   // IO x3, heartbeat
  EXPECT_EQ(md->DoMD(fetch_.get(), motion, level), 3);  // VMD 5
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 100u);
}

INSTANTIATE_TEST_SUITE_P(Makers, AlertStreamEmulationTest,
                         ::testing::Values(Case{"hikvision", "/Event/notification/alertStream",
                                                "http://www.hikvision.com/ver10/XMLSchema"},
                                           Case{"psia",
                                                "/PSIA/Custom/Event/notification/alertStream",
                                                "urn:psialliance-org"}),
                         [](const ::testing::TestParamInfo<Case>& info) { return info.param.key; });

}  // namespace
}  // namespace evsim
