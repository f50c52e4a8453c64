// The JPEG encoder of the simulator and the emulations whose state travels in media: the
// Panasonic, Vivotek and JVC motion-JPEG streams and the IPux status records, each read part
// by part and judged by the library's own detectors.

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "detectors/ipux.h"
#include "detectors/media/jpghdrdetector.h"
#include "detectors/media/rtphdrdetector.h"
#include "framework/host/camera.h"
#include "framework/host/fetcher.h"
#include "framework/host/rtpfetch.h"
#include "sim/scene/mjpeg.h"
#include "sim/simulator.h"

namespace evsim {
namespace {

TEST(MjpegTest, EncodeRejectsBadArguments) {
  const unsigned char pixels[12] = {};
  EXPECT_FALSE(EncodeJpeg(JpegImage{pixels, 2, 2, 3}, {}).empty());
  EXPECT_TRUE(EncodeJpeg(JpegImage{nullptr, 2, 2, 3}, {}).empty());
  EXPECT_TRUE(EncodeJpeg(JpegImage{pixels, 0, 2, 3}, {}).empty());
  EXPECT_TRUE(EncodeJpeg(JpegImage{pixels, 2, 2, 2}, {}).empty());
  EXPECT_TRUE(EncodeJpeg(JpegImage{pixels, 2, 2, 1}, {{0xDB, "x"}}).empty()) << "not COM or APPn";
  EXPECT_TRUE(EncodeJpeg(JpegImage{pixels, 2, 2, 1}, {{kJpegCom, std::string(65534, 'x')}}).empty());
  EXPECT_FALSE(EncodeJpeg(JpegImage{pixels, 2, 2, 1}, {{kJpegCom, std::string(65533, 'x')}}).empty());
  JpegOptions bad;
  bad.quality = 0;
  EXPECT_TRUE(EncodeJpeg(JpegImage{pixels, 2, 2, 1}, {}, bad).empty());
}

TEST(MjpegTest, SegmentsFollowTheStartOfImageInOrder) {
  const std::string frame = EncodeGreyJpeg(8, 8, 0, {{kJpegApp2, "two"}, {kJpegCom, "c"}});
  ASSERT_GT(frame.size(), 16u);
  EXPECT_EQ(frame.substr(0, 11), std::string("\xFF\xD8\xFF\xE2\x00\x05two\xFF\xFE", 11));
  JpegOptions jfif;
  jfif.jfif = true;
  const std::string with_jfif = EncodeGreyJpeg(8, 8, 0, {{kJpegCom, "c"}}, jfif);
  EXPECT_EQ(with_jfif.substr(2, 2), "\xFF\xE0");
  EXPECT_EQ(with_jfif.substr(6, 5), std::string("JFIF\0", 5));
}

class MediaEmulationTest : public ::testing::Test {
 protected:
  void Start(const std::string& key) {
    SimOptions options;
    options.emulations = {key};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
    CameraRecord record;
    record.host = "127.0.0.1";
    record.port = cam_->port;
    camera_ = std::make_unique<Camera>(record);
  }
  // The next part of the stream at target, read by a fresh reader.
  std::string Part(const std::string& target) {
    MultipartFetch fetch("127.0.0.1", cam_->port, target.c_str(), "", "", 10);
    int length = 0;
    char header[128];
    if (fetch.ReadPartHeader(&length, header, sizeof(header)) != 0 || length <= 0) return "";
    std::string body(static_cast<size_t>(length), '\0');
    if (fetch.ReadPartBody(&body[0], length) != 0) return "";
    return body;
  }
  struct Reading {
    bool state;
    unsigned int level;
  };
  Reading Judge(JpgHdrDetector& detector, std::string frame) {
    Reading r{false, 0};
    r.state = detector.DoED(frame.empty() ? nullptr : &frame[0], static_cast<int>(frame.size()), r.level);
    return r;
  }

  Simulator sim_;
  const SimCamera* cam_ = nullptr;
  std::unique_ptr<Camera> camera_;
};

TEST_F(MediaEmulationTest, PanasonicComCarriesMotionAndBothInputLayouts) {
  Start("panasonic");
  const std::string path = "/nphMotionJpeg?Resolution=160x120&Quality=Standard";
  PanaJpgED motion(camera_.get(), nullptr, EVENT_DET_MOTION, PANA_FUNC_GR_0);
  PanaJpgED group0(camera_.get(), nullptr, EVENT_DET_INPUT, PANA_FUNC_GR_0);
  PanaJpgED group1(camera_.get(), nullptr, EVENT_DET_INPUT, PANA_FUNC_GR_1);
  Reading r = Judge(motion, Part(path));
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_FALSE(Judge(group0, Part(path)).state);
  EXPECT_FALSE(Judge(group1, Part(path + "&group=1")).state);

  cam_->state->SetMotion(100);
  cam_->state->SetInput(1, true);
  r = Judge(motion, Part(path));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
  EXPECT_TRUE(Judge(group0, Part(path)).state);
  EXPECT_TRUE(Judge(group1, Part(path + "&group=1")).state);
  cam_->state->SetMotion(40);
  r = Judge(motion, Part(path));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 40u);
}

TEST_F(MediaEmulationTest, VivotekFramesCarryBothRecords) {
  Start("vivotek");
  VivotekJpgMD app0(camera_.get(), nullptr, nullptr, VIVO_FUNC_GR_APP0);
  VivotekJpgMD app2(camera_.get(), nullptr, nullptr, VIVO_FUNC_GR_APP2);
  Reading r = Judge(app0, Part("/video.mjpg"));
  EXPECT_FALSE(r.state);
  r = Judge(app2, Part("/video.mjpg"));
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  cam_->state->SetMotion(100);
  r = Judge(app0, Part("/video.mjpg"));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 96u);
  r = Judge(app2, Part("/video.mjpg?fps=100"));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 127u);
  cam_->state->SetMotion(50);
  EXPECT_EQ(Judge(app2, Part("/video.mjpg")).level, 63u);
}

// The verdict on the extension of the next RTP packet, or nullopt when the reader fails.
std::optional<std::pair<bool, unsigned int>> NextMp4Reading(RtpFetch& fetch) {
  unsigned int length = 0;
  if (fetch.NextHdrInfo(length) != 0 || length == 0) return std::nullopt;
  std::string data(length, '\0');
  if (fetch.FetchExtData(reinterpret_cast<unsigned char*>(&data[0]), length) != 0) {
    return std::nullopt;
  }
  VivotekMp4MD judge(nullptr, nullptr, VIVO_FUNC_GR_APP0);
  unsigned int level = 0;
  bool state = judge.IsEventDetected(&data[0], length, level);
  return std::make_pair(state, level);
}

// Reads packets until one shows `state` (at most 200); its level, or -1.
int LevelOnceStateIs(RtpFetch& fetch, bool state) {
  for (int i = 0; i < 200; ++i) {
    auto reading = NextMp4Reading(fetch);
    if (!reading) return -1;
    if (reading->first == state) return static_cast<int>(reading->second);
  }
  return -1;
}

TEST_F(MediaEmulationTest, VivotekRtpPacketsCarryTheMpeg4Record) {
  Start("vivotek");
  ASSERT_GT(cam_->tcp_port, 0);
  RtpFetch fetch("127.0.0.1", cam_->tcp_port, "/live.sdp", "", "", "RTPExPlayer");
  auto first = NextMp4Reading(fetch);
  ASSERT_TRUE(first.has_value());
  EXPECT_FALSE(first->first);
  EXPECT_EQ(first->second, 0u);
  cam_->state->SetMotion(100);
  EXPECT_EQ(LevelOnceStateIs(fetch, true), 127);
  cam_->state->SetMotion(50);
  for (int i = 0; i < 200; ++i) {
    auto reading = NextMp4Reading(fetch);
    ASSERT_TRUE(reading.has_value());
    if (reading->second == 63u) break;
    ASSERT_EQ(reading->second, 127u) << "only the old level comes before the new one";
  }
  cam_->state->SetMotion(0);
  EXPECT_EQ(LevelOnceStateIs(fetch, false), 0);
  // A camera that falls silent ends its session.
  cam_->state->SetSilent(true);
  EXPECT_EQ(LevelOnceStateIs(fetch, true), -1);
  EXPECT_FALSE(NextMp4Reading(fetch).has_value());
}

TEST(VivotekRtspAuthTest, RtspAsksForTheSimulatorsCredentials) {
  Simulator sim;
  SimOptions options;
  options.emulations = {"vivotek"};
  options.auth = AuthScheme::kBasic;
  options.user = "admin";
  options.password = "pw";
  std::string error;
  ASSERT_TRUE(sim.Start(options, &error)) << error;
  const int port = sim.Cameras().at(0).tcp_port;
  RtpFetch good("127.0.0.1", port, "/live.sdp", "admin", "pw", "RTPExPlayer");
  unsigned int length = 0;
  EXPECT_EQ(good.NextHdrInfo(length), 0);
  EXPECT_GT(length, 0u);
  RtpFetch bad("127.0.0.1", port, "/live.sdp", "admin", "other", "RTPExPlayer", 2);
  EXPECT_NE(bad.NextHdrInfo(length), 0);
  RtpFetch none("127.0.0.1", port, "/live.sdp", "", "", "RTPExPlayer", 2);
  EXPECT_NE(none.NextHdrInfo(length), 0);
}

TEST_F(MediaEmulationTest, JvcComFlagsMotionAtByte233) {
  Start("jvc");
  JVCJpgMD jvc(camera_.get(), nullptr, nullptr);
  EXPECT_FALSE(Judge(jvc, Part("/api/video?encode=jpeg")).state);
  cam_->state->SetMotion(10);
  Reading r = Judge(jvc, Part("/api/video?encode=jpeg"));
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
}

TEST_F(MediaEmulationTest, IpuxRecordsCarryMotionAndInputs) {
  Start("ipux");
  IPuxMD md(camera_.get(), nullptr, nullptr);
  IPuxEID eid(camera_.get(), nullptr, 1, nullptr);
  std::string record = Part("/cgi-bin/status.cgi");
  ASSERT_EQ(record.size(), 32u);
  unsigned int level = 7;
  EXPECT_FALSE(md.IsMotionDetected(&record[0], 32, level));
  EXPECT_EQ(level, 0u);
  cam_->state->SetMotion(100);
  cam_->state->SetInput(1, true);
  record = Part("/cgi-bin/status.cgi");
  EXPECT_TRUE(md.IsMotionDetected(&record[0], 32, level));
  EXPECT_EQ(level, 99u);
  bool input = false;
  eid.QueryCamera(&record[0], 32, input);
  EXPECT_TRUE(input);
  cam_->state->SetMotion(50);
  record = Part("/cgi-bin/status.cgi");
  md.IsMotionDetected(&record[0], 32, level);
  EXPECT_EQ(level, 50u);
}

TEST_F(MediaEmulationTest, StreamsEndWhenTheCameraFallsSilent) {
  Start("jvc");
  MultipartFetch fetch("127.0.0.1", cam_->port, "/api/video", "", "", 10);
  int length = 0;
  char header[128];
  ASSERT_EQ(fetch.ReadPartHeader(&length, header, sizeof(header)), 0);
  cam_->state->SetSilent(true);
  int parts = 0;
  while (fetch.ReadPartHeader(&length, header, sizeof(header)) == 0 && parts < 1000) ++parts;
  EXPECT_LT(parts, 1000) << "the stream went on";
}

}  // namespace
}  // namespace evsim
