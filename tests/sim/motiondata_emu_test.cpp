// The motion-data streams of the Axis, AVIPC, Zavio, AirLive and IQeye emulations: the lines
// of their parts, and each maker's motion detector reading them with the camera's `api:`
// block as evwatch would.

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>

#include "detectors/airlive.h"
#include "detectors/avipc.h"
#include "detectors/axis.h"
#include "detectors/iqeye.h"
#include "detectors/zavio.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/fetcher.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

struct Case {
  std::string key;
  std::string path;         // where the stream is pushed
  std::string still_line;   // the first line at motion 0
  std::string moving_line;  // the first line at motion 60
};

class MotionDataEmulationTest : public ::testing::TestWithParam<Case> {
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
    // The camera's api: block, as evwatch would build it.
    CameraAPIRecord api;
    if (cam_->emulation->api) {
      nlohmann::json block = cam_->emulation->api(cam_->port);
      if (block.contains("name")) api.api = block["name"].get<std::string>();
      if (block.contains("stream")) {
        api.stream = StreamLocation{block["stream"]["path"].get<std::string>(),
                                    block["stream"]["port"].get<int>()};
      }
    }
    api_ = std::make_unique<CameraAPI>(api);
    fetch_ = std::make_unique<MultipartFetch>("127.0.0.1", cam_->port, GetParam().path.c_str(), "",
                                              "", 10);
  }
  std::unique_ptr<DetectorBase> MakeDetector() {
    const std::string& key = GetParam().key;
    if (key == "axis") return std::make_unique<AxisMD>(camera_.get(), api_.get());
    if (key == "avipc") return std::make_unique<AvipcMD>(camera_.get(), api_.get());
    if (key == "zavio") return std::make_unique<ZavioMD>(camera_.get(), api_.get());
    if (key == "airlive") return std::make_unique<AirliveV1MD>(camera_.get());
    return std::make_unique<IQeyeV2MD>(camera_.get());
  }
  int DoMD(DetectorBase* d, bool& motion, unsigned int& level) {
    if (auto* x = dynamic_cast<AxisMD*>(d)) return x->DoMD(fetch_.get(), motion, level);
    if (auto* x = dynamic_cast<AvipcMD*>(d)) return x->DoMD(fetch_.get(), motion, level);
    if (auto* x = dynamic_cast<ZavioMD*>(d)) return x->DoMD(fetch_.get(), motion, level);
    if (auto* x = dynamic_cast<AirliveV1MD*>(d)) return x->DoMD(fetch_.get(), motion, level);
    return dynamic_cast<IQeyeV2MD&>(*d).DoMD(fetch_.get(), motion, level);
  }
  std::string NextBody() {
    int length = 0;
    char header[128];
    if (fetch_->ReadPartHeader(&length, header, sizeof(header)) != 0) return "";
    std::string body(static_cast<size_t>(length), '\0');
    if (fetch_->ReadPartBody(&body[0], length) != 0) return "";
    return body;
  }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  std::unique_ptr<Camera> camera_;
  std::unique_ptr<CameraAPI> api_;
  std::unique_ptr<MultipartFetch> fetch_;
};

TEST_P(MotionDataEmulationTest, PartsHoldOneLinePerWindow) {
  std::string body = NextBody();
  EXPECT_EQ(body.substr(0, body.find("\r\n")), GetParam().still_line) << body;
  EXPECT_EQ(std::count(body.begin(), body.end(), '\n'), 2) << body;
  cam_->state->SetMotion(60);
  // A part already on its way may still show the old level.
  body = NextBody();
  if (body.rfind(GetParam().still_line, 0) == 0) body = NextBody();
  EXPECT_EQ(body.substr(0, body.find("\r\n")), GetParam().moving_line) << body;
}

TEST_P(MotionDataEmulationTest, DetectorReadsTheLevel) {
  std::unique_ptr<DetectorBase> detector = MakeDetector();
  bool motion = true;
  unsigned int level = 7;
  ASSERT_EQ(DoMD(detector.get(), motion, level), 0);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
  cam_->state->SetMotion(60);
  for (int i = 0; i < 2 && !motion; ++i) ASSERT_EQ(DoMD(detector.get(), motion, level), 0);
  EXPECT_TRUE(motion);
  EXPECT_EQ(level, 60u);
  cam_->state->SetMotion(10);  // below the threshold of 20
  for (int i = 0; i < 2 && motion; ++i) ASSERT_EQ(DoMD(detector.get(), motion, level), 0);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, GetParam().key == "zavio" ? 10u : 0u) << "the last line's level, or the largest";
}

TEST_P(MotionDataEmulationTest, SilentCameraEndsItsStream) {
  ASSERT_FALSE(NextBody().empty());
  cam_->state->SetSilent(true);
  bool ended = false;
  for (int i = 0; i < 3 && !ended; ++i) ended = NextBody().empty();
  EXPECT_TRUE(ended);
}

INSTANTIATE_TEST_SUITE_P(
    Makers, MotionDataEmulationTest,
    ::testing::Values(Case{"axis", "/axis-cgi/motion/motiondata.cgi",
                           "group=0;level=0;threshold=20;", "group=0;level=60;threshold=20;"},
                      Case{"avipc", "/cgi-bin/motion/motiondata.cgi",
                           "group=0;level=0;threshold=20;", "group=0;level=60;threshold=20;"},
                      Case{"zavio", "/cgi-bin/motion/motiondata.cgi",
                           "group=0;level=0;threshold=200;", "group=0;level=600;threshold=200;"},
                      Case{"airlive", "/motion/motiondata.cgi", "group=0;level=0;threshold=20;",
                           "group=0;level=60;threshold=20;"},
                      Case{"iqeye", "/now.motiondata", "window=1;level=0;threshold=20",
                           "window=1;level=60;threshold=20"}),
    [](const ::testing::TestParamInfo<Case>& info) { return info.param.key; });

}  // namespace
}  // namespace evsim
