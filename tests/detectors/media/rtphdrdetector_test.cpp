#include "detectors/media/rtphdrdetector.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/host/rtpfetch.h"
#include "sim/net/rtspserver.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakertspcamera.h"

namespace {

using evsim::AuthScheme;
using evsim::HttpAuth;
using evsim::RtspStream;
using evtest::EventRecorder;
using evtest::FakeRtspCamera;
using evtest::Report;
using std::chrono::milliseconds;
using std::chrono::seconds;

const char kStream[] = "/live/mpeg4.sdp";
const char kOtherStream[] = "/other.sdp";
const int kVideoType = 2;

// Extension data as the camera writes it: "mp4v", one byte, a zero byte, nine bytes, then
// the count and the record's first two bytes (p = 15).
std::string Mp4Record(unsigned char count, unsigned char first, unsigned char second) {
  std::string p = "mp4v";
  p += 'x';
  p += '\0';
  p += std::string(9, '\x07');
  p += static_cast<char>(count);
  p += static_cast<char>(first);
  p += static_cast<char>(second);
  return p;
}

// The readings of the edge cases: motion at level 0x0B; valid without trigger; not valid.
const std::string kMotion = Mp4Record(0x01, 0xC5, 0x80);
const std::string kValidNoTrigger = Mp4Record(0x01, 0x85, 0x80);
const std::string kNotValid = Mp4Record(0x01, 0x45, 0x80);

struct Reading {
  bool state;
  unsigned int level;
  bool operator==(const Reading& o) const { return state == o.state && level == o.level; }
};

void PrintTo(const Reading& r, std::ostream* os) {
  *os << "(" << (r.state ? "true" : "false") << ", " << r.level << ")";
}

// A camera stream whose packet n carries extension(n), one every 10 ms.
RtspStream Stream(std::function<std::optional<std::string>(uint64_t)> extension) {
  RtspStream s;
  s.period = milliseconds(10);
  s.extension = std::move(extension);
  return s;
}

RtspStream Always(const std::string& data) {
  return Stream([data](uint64_t) { return std::optional<std::string>(data); });
}

// At least the back-off's report and the final one, and nothing but (false, 0).
void ExpectOnlyNoMotion(const std::vector<Report>& reports) {
  EXPECT_GE(reports.size(), 2u);
  for (const Report& r : reports) EXPECT_EQ(r, (Report{false, 0}));
}

class RtpHdrTest : public ::testing::Test {
 protected:
  // The camera's RTSP server serves connection n with script(n).
  void Serve(std::function<RtspStream(int)> script) {
    cam_ = std::make_unique<FakeRtspCamera>(std::move(script));
    CameraRecord record;
    record.host = "127.0.0.1";
    record.port = 80;  // the HTTP port; the stream's port comes from the API
    record.username = "viewer";
    record.password = "secret";
    record.stream_type = 1;
    record.video_type = kVideoType;
    camera_ = std::make_unique<Camera>(record);
    CameraAPIRecord api;
    api.stream = StreamLocation{kOtherStream, cam_->Port()};
    api.streams[{kVideoType, 1}] = StreamLocation{kStream, cam_->Port()};
    api_ = std::make_unique<CameraAPI>(api);
  }

  Reading Judge(const std::string& data, VIVO_FUNC_GR group = VIVO_FUNC_GR_APP0) {
    VivotekMp4MD detector(nullptr, nullptr, group);
    std::string copy = data;
    Reading r{true, 77};
    r.state = detector.IsEventDetected(copy.empty() ? nullptr : &copy[0],
                                       static_cast<unsigned int>(copy.size()), r.level);
    return r;
  }

  // Runs a detector on the camera until pred holds for its reports, then stops it and
  // returns every report, the final one included.
  std::vector<Report> RunUntil(const std::function<bool(const std::vector<Report>&)>& pred,
                               milliseconds deadline = seconds(30)) {
    EventBuf events;
    EventRecorder recorder(events);
    VivotekMp4MD detector(camera_.get(), api_.get(), VIVO_FUNC_GR_APP0);
    EXPECT_EQ(detector.Init(&events, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitFor(pred, deadline));
    EXPECT_EQ(detector.Stop(), 0);
    return recorder.Reports();
  }

  std::unique_ptr<FakeRtspCamera> cam_;
  std::unique_ptr<Camera> camera_;
  std::unique_ptr<CameraAPI> api_;
};

TEST_F(RtpHdrTest, ValidAndTriggerGiveMotionWithTheSevenBitLevel) {
  EXPECT_EQ(Judge(kMotion), (Reading{true, 0x0B}));
  Serve([](int) { return Always(kMotion); });
  std::vector<Report> reports =
      RunUntil([](const std::vector<Report>& r) { return r.size() >= 3; });
  EXPECT_EQ(reports[0], (Report{true, 0x0B}));
  EXPECT_EQ(reports[1], (Report{true, 0x0B}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST_F(RtpHdrTest, ValidWithoutTriggerIsNoMotionButKeepsTheLevel) {
  EXPECT_EQ(Judge(kValidNoTrigger), (Reading{false, 0x0B}));
  Serve([](int) { return Always(kValidNoTrigger); });
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  EXPECT_EQ(reports[0], (Report{false, 0x0B}));
}

TEST_F(RtpHdrTest, RecordWithoutValidBitIsNoMotionAtLevelZero) {
  EXPECT_EQ(Judge(kNotValid), (Reading{false, 0}));
  EXPECT_EQ(Judge(Mp4Record(0x01, 0x7F, 0xFF)), (Reading{false, 0}));
  Serve([](int) { return Always(Mp4Record(0x01, 0x7F, 0xFF)); });
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  EXPECT_EQ(reports[0], (Report{false, 0}));
}

TEST_F(RtpHdrTest, PacketWithoutExtensionIsNotReported) {
  // Packet 0 shows motion, packet 1 has no extension, every later one shows none.
  Serve([](int) {
    return Stream([](uint64_t n) -> std::optional<std::string> {
      if (n == 0) return kMotion;
      if (n == 1) return std::nullopt;
      return kValidNoTrigger;
    });
  });
  std::vector<Report> reports =
      RunUntil([](const std::vector<Report>& r) { return r.size() >= 2; });
  // Had the empty packet's pass reported, its reading would stand between these two.
  EXPECT_EQ(reports[0], (Report{true, 0x0B}));
  EXPECT_EQ(reports[1], (Report{false, 0x0B}));
  EXPECT_EQ(cam_->Connections(), 1);
}

TEST_F(RtpHdrTest, EveryLevelBitAndTheFunctionGroupIsNotConsulted) {
  for (int b = 0x80; b <= 0xFF; ++b) {
    for (int next : {0x00, 0x7F, 0x80, 0xFF}) {
      const unsigned int level = ((static_cast<unsigned int>(b) << 1) & 0x7E) | (next >> 7);
      const Reading expected{(b & 0x40) != 0, level};
      const std::string data = Mp4Record(0x02, static_cast<unsigned char>(b),
                                         static_cast<unsigned char>(next));
      EXPECT_EQ(Judge(data, VIVO_FUNC_GR_APP0), expected) << b << " " << next;
      EXPECT_EQ(Judge(data, VIVO_FUNC_GR_APP2), expected) << b << " " << next;
      EXPECT_EQ(Judge(data, static_cast<VIVO_FUNC_GR>(7)), expected) << b << " " << next;
    }
  }
}

TEST_F(RtpHdrTest, CountZeroIsNoMotion) {
  EXPECT_EQ(Judge(Mp4Record(0x00, 0xC5, 0x80)), (Reading{false, 0}));
}

TEST_F(RtpHdrTest, TagSearchBounds) {
  // The byte after the tag's next one must be zero: a tag followed otherwise is passed over
  // and a later one is found.
  std::string wrong = "mp4vxy" + std::string(9, '\0') + "\x01\xC5\x80";
  EXPECT_EQ(Judge(wrong), (Reading{false, 0}));
  EXPECT_EQ(Judge("zz" + kMotion), (Reading{true, 0x0B}));
  EXPECT_EQ(Judge(wrong + kMotion), (Reading{true, 0x0B}));
  // The last start tried is length - 5; a tag that starts at length - 4 is not found.
  const std::string tail5 = std::string(3, 'a') + "mp4v" + std::string(1, '\0');
  const std::string tail4 = std::string(4, 'a') + "mp4v";
  unsigned int level = 77;
  VivotekMp4MD d(nullptr, nullptr, VIVO_FUNC_GR_APP0);
  std::string copy = tail4;
  EXPECT_FALSE(d.IsEventDetected(&copy[0], static_cast<unsigned int>(copy.size()), level));
  EXPECT_EQ(level, 0u);
  // Found at length - 5: the record lies past the data, which reads as zeros.
  copy = tail5;
  EXPECT_FALSE(d.IsEventDetected(&copy[0], static_cast<unsigned int>(copy.size()), level));
  EXPECT_EQ(level, 0u);
}

TEST_F(RtpHdrTest, RecordCutShortReadsAsZeros) {
  // The last level bit lies past the data: read as 0.
  std::string cut = kMotion.substr(0, kMotion.size() - 1);
  EXPECT_EQ(Judge(cut), (Reading{true, 0x0A}));
  // The record's first byte lies past the data: not valid.
  cut = kMotion.substr(0, kMotion.size() - 2);
  EXPECT_EQ(Judge(cut), (Reading{false, 0}));
}

TEST_F(RtpHdrTest, NullOrEmptyDataIsNoMotionAtLevelZero) {
  VivotekMp4MD d(nullptr, nullptr, VIVO_FUNC_GR_APP0);
  unsigned int level = 77;
  EXPECT_FALSE(d.IsEventDetected(nullptr, 20, level));
  EXPECT_EQ(level, 0u);
  level = 77;
  char byte = 'm';
  EXPECT_FALSE(d.IsEventDetected(&byte, 0, level));
  EXPECT_EQ(level, 0u);
  // DoED is the same verdict.
  std::string copy = kMotion;
  level = 0;
  EXPECT_TRUE(d.DoED(&copy[0], static_cast<unsigned int>(copy.size()), level));
  EXPECT_EQ(level, 0x0Bu);
}

TEST_F(RtpHdrTest, AsksThePreparedStreamWithTheClientNameAndCredentials) {
  Serve([](int) {
    RtspStream s = Always(kMotion);
    s.auth = HttpAuth(AuthScheme::kDigest, "viewer", "secret");
    return s;
  });
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  EXPECT_EQ(reports[0], (Report{true, 0x0B}));
  const std::string url = "rtsp://127.0.0.1:" + std::to_string(cam_->Port()) + kStream;
  std::vector<std::string> authorised;
  for (const evsim::HttpRequest& r : cam_->Requests()) {
    EXPECT_EQ(r.Header("User-Agent"), "RTPExPlayer") << r.method;
    if (r.method == "OPTIONS" || r.method == "DESCRIBE") {
      EXPECT_EQ(r.target, url);
    }
    if (r.Header("Authorization").empty()) continue;
    EXPECT_EQ(r.Header("Authorization").substr(0, 7), "Digest ");
    authorised.push_back(r.method);
  }
  // The session was torn down when the detector stopped.
  ASSERT_TRUE(cam_->WaitForMethod("TEARDOWN"));
  std::vector<std::string> expected{"OPTIONS", "DESCRIBE", "SETUP", "PLAY"};
  ASSERT_GE(authorised.size(), 4u);
  EXPECT_EQ(std::vector<std::string>(authorised.begin(), authorised.begin() + 4), expected);
  EXPECT_EQ(authorised.back(), "TEARDOWN");
}

TEST_F(RtpHdrTest, CameraThatClosesTheSessionIsReadAgainAndThenReconnected) {
  // The first session ends after one packet with motion; the next shows none.
  Serve([](int connection) {
    RtspStream s = Always(connection == 0 ? kMotion : kValidNoTrigger);
    if (connection == 0) s.close_after = 1;
    return s;
  });
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) {
    return !r.empty() && r.back() == Report{false, 0x0B};
  });
  EXPECT_EQ(reports[0], (Report{true, 0x0B}));
  // The failed read's pass judges the data it kept from the last packet, without a back-off.
  EXPECT_EQ(reports[1], (Report{true, 0x0B}));
  EXPECT_EQ(cam_->Connections(), 2);
  EXPECT_EQ(cam_->Count("SETUP"), 2);
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST_F(RtpHdrTest, CameraThatStopsSendingIsGivenUpAfterTheTimeoutAndReconnected) {
  Serve([](int connection) {
    RtspStream s = Always(connection == 0 ? kMotion : kValidNoTrigger);
    if (connection == 0) s.silent_after = 2;
    return s;
  });
  std::vector<Report> reports = RunUntil(
      [](const std::vector<Report>& r) { return !r.empty() && r.back() == Report{false, 0x0B}; },
      seconds(RtpFetch::kDefaultTimeout * 3));
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{true, 0x0B}));
  EXPECT_EQ(reports[1], (Report{true, 0x0B}));
  EXPECT_EQ(reports[2], (Report{true, 0x0B})) << "the kept data, judged after the time-out";
  EXPECT_EQ(cam_->Connections(), 2);
  // The hung session is not torn down: the camera answers nothing.
  EXPECT_EQ(cam_->Count("PLAY"), 2);
}

TEST_F(RtpHdrTest, WithoutAnyExtensionDataAFailedStreamBacksOffAndReportsNoMotion) {
  // Wrong credentials: no session, no data ever.
  Serve([](int) {
    RtspStream s = Always(kMotion);
    s.auth = HttpAuth(AuthScheme::kDigest, "viewer", "other");
    return s;
  });
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  ExpectOnlyNoMotion(reports);
  EXPECT_EQ(cam_->Count("SETUP"), 0);
  EXPECT_GE(cam_->Connections(), 1);
}

TEST_F(RtpHdrTest, CameraOfAnotherStreamTypeIsNotAsked) {
  Serve([](int) { return Always(kMotion); });
  CameraRecord record;
  record.host = "127.0.0.1";
  record.stream_type = 0;
  record.video_type = kVideoType;
  camera_ = std::make_unique<Camera>(record);
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  ExpectOnlyNoMotion(reports);
  EXPECT_EQ(cam_->Connections(), 0);
}

TEST_F(RtpHdrTest, StreamPathUnavailableMeansNoReader) {
  Serve([](int) { return Always(kMotion); });
  api_ = std::make_unique<CameraAPI>(CameraAPIRecord{});
  std::vector<Report> reports = RunUntil([](const std::vector<Report>& r) { return !r.empty(); });
  ExpectOnlyNoMotion(reports);
  EXPECT_EQ(cam_->Connections(), 0);
}

TEST_F(RtpHdrTest, NullCameraOrApiReportsOnceAndEndsTheLoop) {
  Serve([](int) { return Always(kMotion); });
  for (int which = 0; which < 2; ++which) {
    EventBuf events;
    EventRecorder recorder(events);
    VivotekMp4MD detector(which == 0 ? nullptr : camera_.get(), which == 0 ? api_.get() : nullptr,
                          VIVO_FUNC_GR_APP0);
    ASSERT_EQ(detector.Init(&events, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitForCount(1));
    EXPECT_TRUE(detector.IsStarted());
    EXPECT_EQ(detector.Stop(), 0);
    EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 0}}));
  }
  EXPECT_EQ(cam_->Connections(), 0);
}

TEST_F(RtpHdrTest, GetExtDataLenAndFetchExtDataMapResults) {
  Serve([](int) { return Always(kMotion); });
  VivotekMp4MD d(camera_.get(), api_.get(), VIVO_FUNC_GR_APP0);
  unsigned int length = 5;
  char buffer[64];
  EXPECT_EQ(d.GetExtDataLen(nullptr, length), -1);
  EXPECT_EQ(length, 5u);
  EXPECT_EQ(d.FetchExtData(nullptr, buffer, 4), -1);

  RtpFetch fetch("127.0.0.1", cam_->Port(), kStream, "", "", "test");
  ASSERT_EQ(d.GetExtDataLen(&fetch, length), 0);
  ASSERT_EQ(length, 20u);  // 18 bytes, padded to whole words
  ASSERT_EQ(d.FetchExtData(&fetch, buffer, length), 0);
  EXPECT_EQ(std::string(buffer, kMotion.size()), kMotion);
  // More than the packet holds fails without harming the reader.
  EXPECT_EQ(d.FetchExtData(&fetch, buffer, length + 4), -1);
  // No buffer, or no length: the packet is skipped, so nothing of it can be copied after.
  EXPECT_EQ(d.FetchExtData(&fetch, nullptr, length), -1);
  EXPECT_NE(fetch.FetchExtData(reinterpret_cast<unsigned char*>(buffer), 4), 0);
  ASSERT_EQ(d.GetExtDataLen(&fetch, length), 0);
  EXPECT_EQ(d.FetchExtData(&fetch, buffer, 0), -1);
  EXPECT_NE(fetch.FetchExtData(reinterpret_cast<unsigned char*>(buffer), 4), 0);
  ASSERT_EQ(d.GetExtDataLen(&fetch, length), 0);
  EXPECT_EQ(d.FetchExtData(&fetch, buffer, length), 0);
}

TEST_F(RtpHdrTest, DeletingAStartedDetectorStopsIt) {
  Serve([](int) { return Always(kMotion); });
  EventBuf events;
  EventRecorder recorder(events);
  {
    VivotekMp4MD detector(camera_.get(), api_.get(), VIVO_FUNC_GR_APP0);
    ASSERT_EQ(detector.Init(&events, 500), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitForReport(Report{true, 0x0B}));
  }
  const size_t after = recorder.Size();
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  ASSERT_TRUE(cam_->WaitForMethod("TEARDOWN"));
  EXPECT_EQ(recorder.Size(), after);  // nothing reports once the detector is gone
}

}  // namespace
