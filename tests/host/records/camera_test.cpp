#include "framework/host/camera.h"

#include <gtest/gtest.h>

#include <set>
#include <thread>
#include <vector>

#include "framework/host/cameraapi.h"

namespace {

TEST(CameraTest, GettersGiveTheRecord) {
  CameraRecord record;
  record.host = "10.1.2.3";
  record.port = 8080;
  record.username = "admin";
  record.password = "p:w@d";
  record.id = 7;
  record.channel = "2";
  record.stream_type = 1;
  record.video_type = 3;
  record.sensitivity = 70;
  record.threshold = 15;
  record.regions = {MotionRegion("door", 1, 2, 3, 4)};
  Camera camera(record);
  EXPECT_EQ(camera.GetHost(), "10.1.2.3");
  EXPECT_EQ(camera.GetPort(), 8080);
  EXPECT_EQ(camera.GetUsername(), "admin");
  EXPECT_EQ(camera.GetPassword(), "p:w@d");
  EXPECT_EQ(camera.GetId(), 7);
  EXPECT_EQ(camera.GetCH(), "2");
  EXPECT_EQ(camera.GetStmType(), 1);
  EXPECT_EQ(camera.GetVideoType(), 3);
  EXPECT_EQ(camera.GetSensitivity(), 70);
  EXPECT_EQ(camera.GetThreshold(), 15);
  ASSERT_EQ(camera.GetMotionDet().RegionCount(), 1);
  MotionRegion region = camera.GetMotionDet().GetRegion(0);
  EXPECT_EQ(region.Name(), "door");
  EXPECT_EQ(region.Left(), 1);
  EXPECT_EQ(region.Top(), 2);
  EXPECT_EQ(region.Right(), 3);
  EXPECT_EQ(region.Bottom(), 4);
}

TEST(CameraTest, RegionOutOfRangeIsEmpty) {
  Camera camera(CameraRecord{});
  EXPECT_EQ(camera.GetMotionDet().RegionCount(), 0);
  EXPECT_EQ(camera.GetMotionDet().GetRegion(0).Right(), 0);
  EXPECT_EQ(camera.GetMotionDet().GetRegion(-1).Bottom(), 0);
  EXPECT_EQ(camera.GetPort(), 80);
  EXPECT_EQ(camera.GetCH(), "1");
}

CameraAPIRecord TwoStreams() {
  CameraAPIRecord record;
  record.api = "zaviovga";
  record.stream = StreamLocation{"cgi/default", 81};
  record.streams[{1, 2}] = StreamLocation{"/mjpg/video.mjpg?x=1", 8081};
  record.md_params = {{1, 30, 3, 4}};
  return record;
}

TEST(CameraAPITest, PreparedStreamOrDefault) {
  CameraAPI api(TwoStreams());
  std::string path = "unchanged";
  int port = 80;
  ASSERT_EQ(api.GetStreamPath(path, port), 0);  // nothing prepared: the default
  EXPECT_EQ(path, "cgi/default");
  EXPECT_EQ(port, 81);
  api.PrepareStream(1, 2);
  ASSERT_EQ(api.GetStreamPath(path, port), 0);
  EXPECT_EQ(path, "/mjpg/video.mjpg?x=1");
  EXPECT_EQ(port, 8081);
  api.PrepareStream(3, 1);  // not configured: the default again
  ASSERT_EQ(api.GetStreamPath(path, port), 0);
  EXPECT_EQ(path, "cgi/default");
}

TEST(CameraAPITest, NoStreamConfiguredFailsAndLeavesOutputs) {
  CameraAPI api(CameraAPIRecord{});
  std::string path = "keep";
  int port = 80;
  api.PrepareStream(1, 2);
  EXPECT_NE(api.GetStreamPath(path, port), 0);
  EXPECT_EQ(path, "keep");
  EXPECT_EQ(port, 80);
}

TEST(CameraAPITest, SelectionIsPerThread) {
  CameraAPI api(TwoStreams());
  api.PrepareStream(1, 2);
  std::string other;
  int otherPort = 0;
  std::thread([&] { api.GetStreamPath(other, otherPort); }).join();
  EXPECT_EQ(other, "cgi/default");  // the other thread prepared nothing
  std::string mine;
  int port = 0;
  api.GetStreamPath(mine, port);
  EXPECT_EQ(mine, "/mjpg/video.mjpg?x=1");
}

TEST(CameraAPITest, MotionParamsAndApiName) {
  CameraAPI api(TwoStreams());
  int a = 0, b = 0, c = 0, d = 0;
  EXPECT_EQ(api.GetMDParams(a, b, c, d), 0);
  EXPECT_EQ(a, 1);
  EXPECT_EQ(b, 30);
  EXPECT_EQ(c, 3);
  EXPECT_EQ(d, 4);
  EXPECT_EQ(api.GetCameraCap()->GetAPI(), "zaviovga");
}

}  // namespace
