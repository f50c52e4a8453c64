// The scene camera: a motion-JPEG stream of a room whose object moves while the camera's
// motion is on, read over loopback and judged by the host's motion engine.

#include <gtest/gtest.h>

#include <string>

#include "framework/host/fetcher.h"
#include "framework/host/mdengine.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

class SceneEmulationTest : public ::testing::Test {
 protected:
  void SetUp() override {
    SimOptions options;
    options.emulations = {"scene"};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
    ASSERT_EQ(MD_CreateDetection(&engine_), MD_OK);
    MD_EnableFastMD(&engine_, 1);
  }
  void TearDown() override { MD_FinishDetection(&engine_); }

  // Reads the next frame of the stream; empty on failure.
  std::string Frame(MultipartFetch& fetch) {
    int length = 0;
    char header[128];
    if (fetch.ReadPartHeader(&length, header, sizeof(header)) != 0 || length <= 0) return "";
    std::string body(static_cast<size_t>(length), '\0');
    if (fetch.ReadPartBody(body.data(), length) != 0) return "";
    return body;
  }
  int Judge(const std::string& frame) {
    int level = 0;
    return MD_DetectMotionSeq(&engine_, frame.data(), static_cast<int>(frame.size()), &level);
  }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  MD_DETECTION engine_{nullptr};
};

TEST_F(SceneEmulationTest, ObjectMovesOnlyWhileTheCamerasMotionIsOn) {
  MultipartFetch fetch("127.0.0.1", cam_->port, "/scene.mjpg?fps=50", "", "", 5);
  const std::string first = Frame(fetch);
  ASSERT_GT(first.size(), 2u);
  EXPECT_EQ(first.substr(0, 2), "\xFF\xD8");
  EXPECT_EQ(Judge(first), MD_REFERENCE);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(Judge(Frame(fetch)), MD_NO_MOTION);

  cam_->state->SetMotion(100);
  Frame(fetch);  // may have been made before the change
  for (int i = 0; i < 5; ++i) EXPECT_EQ(Judge(Frame(fetch)), MD_MOTION);

  cam_->state->SetMotion(0);
  Frame(fetch);
  Judge(Frame(fetch));  // the frame after the last move
  for (int i = 0; i < 5; ++i) EXPECT_EQ(Judge(Frame(fetch)), MD_NO_MOTION);
}

TEST_F(SceneEmulationTest, OtherPathsAreNotFound) {
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/video.mjpg"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 404", 0), 0u) << raw;
}

TEST_F(SceneEmulationTest, StreamEndsWhenTheCameraFallsSilent) {
  MultipartFetch fetch("127.0.0.1", cam_->port, "/scene.mjpg?fps=50", "", "", 2);
  ASSERT_FALSE(Frame(fetch).empty());
  cam_->state->SetSilent(true);
  int failures = 0;
  for (int i = 0; i < 20 && failures == 0; ++i) failures += Frame(fetch).empty();
  EXPECT_EQ(failures, 1);
}

}  // namespace
}  // namespace evsim
