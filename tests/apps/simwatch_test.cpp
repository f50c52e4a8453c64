#include "apps/camsim/simwatch.h"

#include <gtest/gtest.h>

namespace evsim {
namespace {

class SimWatchTest : public ::testing::Test {
 protected:
  void SetUp() override {
    SimOptions options;
    options.emulations = {"canon"};
    options.count = 2;
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
  }
  Simulator sim_;
};

TEST_F(SimWatchTest, OneCameraEntryPerSimulatedCamera) {
  nlohmann::ordered_json c = evwatch::WatchConfig(SimWatch(sim_.Cameras(), {}), 500);
  EXPECT_EQ(c["interval"], 500);
  ASSERT_EQ(c["cameras"].size(), 2u);
  for (size_t i = 0; i < 2; ++i) {
    const auto& cam = c["cameras"][i];
    EXPECT_EQ(cam["name"], sim_.Cameras()[i].name);
    EXPECT_EQ(cam["host"], "127.0.0.1");
    EXPECT_EQ(cam["port"], sim_.Cameras()[i].port);
    EXPECT_FALSE(cam.contains("user"));
    ASSERT_EQ(cam["detectors"].size(), 2u);
    EXPECT_EQ(cam["detectors"][0]["class"], "CanonMD");
    EXPECT_EQ(cam["detectors"][1]["class"], "CanonEID");
    EXPECT_EQ(cam["detectors"][1]["inputs"], 1);
  }
}

TEST_F(SimWatchTest, KeepsOnlyAcceptedClassesAndCredentials) {
  SimWatchOptions options;
  options.user = "admin";
  options.password = "pw";
  options.keep = [](const std::string& cls) { return cls == "CanonEID"; };
  nlohmann::ordered_json c = evwatch::WatchConfig(SimWatch(sim_.Cameras(), options), 250);
  EXPECT_EQ(c["interval"], 250);
  ASSERT_EQ(c["cameras"].size(), 2u);
  EXPECT_EQ(c["cameras"][0]["user"], "admin");
  EXPECT_EQ(c["cameras"][0]["password"], "pw");
  ASSERT_EQ(c["cameras"][0]["detectors"].size(), 1u);
  EXPECT_EQ(c["cameras"][0]["detectors"][0]["class"], "CanonEID");
}

TEST_F(SimWatchTest, CamerasWithoutEntriesAreLeftOut) {
  SimWatchOptions options;
  options.keep = [](const std::string&) { return false; };
  EXPECT_TRUE(SimWatch(sim_.Cameras(), options).empty());
  EXPECT_TRUE(evwatch::WatchConfig(SimWatch(sim_.Cameras(), options), 500)["cameras"].empty());
}

TEST(SimWatchRtspTest, VivotekCameraNamesItsRtspStreamAndStreamType) {
  Simulator sim;
  SimOptions options;
  options.emulations = {"vivotek"};
  std::string error;
  ASSERT_TRUE(sim.Start(options, &error)) << error;
  const SimCamera& camera = sim.Cameras().at(0);
  ASSERT_GT(camera.tcp_port, 0);
  nlohmann::ordered_json c = evwatch::WatchConfig(SimWatch(sim.Cameras(), {}), 500);
  ASSERT_EQ(c["cameras"].size(), 1u);
  const auto& cam = c["cameras"][0];
  EXPECT_EQ(cam["stream_type"], 1);
  EXPECT_EQ(cam["video_type"], 1);
  // The motion-JPEG stream stays the default; the RTSP stream is the one for (1, 1).
  EXPECT_EQ(cam["api"]["stream"]["path"], "/video.mjpg");
  EXPECT_EQ(cam["api"]["stream"]["port"], camera.port);
  EXPECT_EQ(cam["api"]["streams"]["1,1"]["path"], "/live.sdp");
  EXPECT_EQ(cam["api"]["streams"]["1,1"]["port"], camera.tcp_port);
  bool watched = false;
  for (const auto& d : cam["detectors"]) watched = watched || d["class"] == "VivotekMp4MD";
  EXPECT_TRUE(watched);
}

TEST_F(SimWatchTest, CamerasWithoutStreamTypesLeaveThemOut) {
  nlohmann::ordered_json c = evwatch::WatchConfig(SimWatch(sim_.Cameras(), {}), 500);
  EXPECT_FALSE(c["cameras"][0].contains("stream_type"));
  EXPECT_FALSE(c["cameras"][0].contains("video_type"));
}

}  // namespace
}  // namespace evsim
