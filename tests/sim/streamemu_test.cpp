// The pushed streams of the IQeye, Sony, Etrovision, Edimax, Pixord and Panasonic emulations,
// each watched by its maker's detector with the camera's `api:` block as evwatch would build
// it: the detector follows the camera's state, and a camera that falls silent (its stream
// ends, later requests go unanswered) and speaks again is followed again.

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "detectors/edimax.h"
#include "detectors/etrovision.h"
#include "detectors/iqeye.h"
#include "detectors/panasonic.h"
#include "detectors/pixord.h"
#include "detectors/sony.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "sim/simulator.h"
#include "tests/support/eventrecorder.h"

namespace evsim {
namespace {

using evtest::EventRecorder;
using evtest::Report;

struct Case {
  std::string cls;
  std::string key;
  // Makes the detector for a camera and its API.
  std::function<std::unique_ptr<DetectorBase>(Camera*, CameraAPI*)> make;
  Report active;  // what it reports while motion is 100 and every input is active
  Report idle;    // and while motion is 0 and no input is active
};

StreamLocation Location(const nlohmann::json& block) {
  return StreamLocation{block["path"].get<std::string>(), block["port"].get<int>()};
}

// The camera API that evwatch builds from an emulation's `api:` block.
CameraAPIRecord ApiRecord(const nlohmann::json& block) {
  CameraAPIRecord api;
  if (block.contains("name")) api.api = block["name"].get<std::string>();
  if (block.contains("stream")) api.stream = Location(block["stream"]);
  if (block.contains("streams")) {
    for (const auto& [key, value] : block["streams"].items()) {
      const size_t comma = key.find(',');
      api.streams[{std::stoi(key.substr(0, comma)), std::stoi(key.substr(comma + 1))}] =
          Location(value);
    }
  }
  if (block.contains("md_params")) {
    for (size_t i = 0; i < 4; ++i) api.md_params[i] = block["md_params"][i].get<int>();
  }
  return api;
}

class StreamEmulationTest : public ::testing::TestWithParam<Case> {
 protected:
  void SetUp() override {
    SimOptions options;
    options.emulations = {GetParam().key};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
    CameraRecord r;
    r.host = "127.0.0.1";
    r.port = cam_->port;
    camera_ = std::make_unique<Camera>(r);
    api_ = std::make_unique<CameraAPI>(
        cam_->emulation->api ? ApiRecord(cam_->emulation->api(cam_->port)) : CameraAPIRecord{});
  }
  void SetAll(int motion, bool inputs) {
    cam_->state->SetMotion(motion);
    cam_->state->SetAllInputs(inputs);
  }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  std::unique_ptr<Camera> camera_;
  std::unique_ptr<CameraAPI> api_;
};

TEST_P(StreamEmulationTest, DetectorFollowsTheCameraAndItsSilence) {
  const Case& c = GetParam();
  EventBuf buffer;
  EventRecorder recorder(buffer);
  std::unique_ptr<DetectorBase> detector = c.make(camera_.get(), api_.get());
  ASSERT_EQ(detector->Init(&buffer, 500), 0);
  SetAll(0, false);
  ASSERT_EQ(detector->Start(), 0);
  const auto deadline = std::chrono::seconds(20);
  EXPECT_TRUE(recorder.WaitForReport(c.idle, deadline));
  SetAll(100, true);
  EXPECT_TRUE(recorder.WaitForReport(c.active, deadline));
  cam_->state->SetSilent(true);
  EXPECT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.back() == Report{false, 0}; },
                               deadline))
      << "a camera that stops pushing reads as (false, 0)";
  const size_t silent_at = recorder.Size();
  cam_->state->SetSilent(false);
  EXPECT_TRUE(recorder.WaitFor(
      [&](const std::vector<Report>& r) { return r.size() > silent_at && r.back() == c.active; },
      std::chrono::seconds(40)))
      << "the detector comes back to the camera by itself";
  ASSERT_EQ(detector->Stop(), 0);
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

INSTANTIATE_TEST_SUITE_P(
    Classes, StreamEmulationTest,
    ::testing::Values(
        Case{"IQeyeV1MD", "iqeye", [](Camera* c, CameraAPI*) { return std::make_unique<IQeyeV1MD>(c); },
             Report{true, 100}, Report{false, 0}},
        Case{"IQeyeV2EID", "iqeye",
             [](Camera* c, CameraAPI*) { return std::make_unique<IQeyeV2EID>(c, 1); },
             Report{true, 1}, Report{false, 1}},
        Case{"SONYMD", "sony", [](Camera* c, CameraAPI*) { return std::make_unique<SONYMD>(c); },
             Report{true, 100}, Report{false, 0}},
        Case{"SONYEID", "sony", [](Camera* c, CameraAPI*) { return std::make_unique<SONYEID>(c, 2); },
             Report{true, 1}, Report{false, 1}},
        Case{"ETROVISIONMD", "etrovision",
             [](Camera* c, CameraAPI* a) { return std::make_unique<ETROVISIONMD>(c, a); },
             Report{true, 100}, Report{false, 0}},
        Case{"ETROVISIONEID", "etrovision",
             [](Camera* c, CameraAPI* a) { return std::make_unique<ETROVISIONEID>(c, a, 2); },
             Report{true, 1}, Report{false, 1}},
        Case{"EDIMAXMD", "edimax",
             [](Camera* c, CameraAPI* a) { return std::make_unique<EDIMAXMD>(c, a); },
             Report{true, 100}, Report{false, 0}},
        Case{"PIXORDMD", "pixord",
             [](Camera* c, CameraAPI* a) { return std::make_unique<PIXORDMD>(c, a); },
             Report{true, 100}, Report{false, 0}},
        Case{"PanaMD", "panasonic",
             [](Camera* c, CameraAPI* a) { return std::make_unique<PanaMD>(c, a); },
             Report{true, 100}, Report{false, 0}},
        Case{"PanaEID", "panasonic",
             [](Camera* c, CameraAPI* a) { return std::make_unique<PanaEID>(c, a, 2); },
             Report{true, 1}, Report{false, 1}}),
    [](const ::testing::TestParamInfo<Case>& info) { return info.param.cls; });

}  // namespace
}  // namespace evsim
