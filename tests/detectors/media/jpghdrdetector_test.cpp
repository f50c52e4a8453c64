#include "detectors/media/jpghdrdetector.h"

#include <gtest/gtest.h>
#include <syslog.h>

#include <atomic>
#include <functional>
#include <mutex>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"
#include "sim/scene/mjpeg.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evsim::EncodeGreyJpeg;
using evsim::JpegOptions;
using evsim::JpegSegment;
using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::MultipartWriter;
using evtest::Report;
using std::chrono::milliseconds;
using std::chrono::seconds;

const int kCom = 0xFE;
const int kApp0 = 0xE0;
const int kApp2 = 0xE2;
const char kStream[] = "/jpeg/stream.mjpg";
const char kOtherStream[] = "/jpeg/other.mjpg";

// Payloads, byte for byte as the cameras write them.
std::string PanaCom(unsigned char byte0, unsigned char byte12, unsigned char byte13) {
  std::string p(32, '\0');
  p[0] = static_cast<char>(byte0);
  p[12] = static_cast<char>(byte12);
  p[13] = static_cast<char>(byte13);
  return p;
}

std::string VivoApp0(unsigned char byte6, unsigned char byte7) {
  std::string p(16, '\0');
  p.replace(0, 4, "VVTK");
  p[6] = static_cast<char>(byte6);
  p[7] = static_cast<char>(byte7);
  return p;
}

// An APP2 record: `lead` bytes, the tag "jpeg" and 11 bytes up to the count, the count,
// then the record bytes.
std::string VivoApp2(unsigned char count, const std::string& bits, size_t lead = 3) {
  std::string p(lead, 'z');
  p += "jpeg";
  p += std::string(11, '\x01');
  p += static_cast<char>(count);
  p += bits;
  return p;
}

std::string JvcCom(char flag, size_t size = 256) {
  std::string p(size, '0');
  if (size > 233) p[233] = flag;
  return p;
}

std::string Frame(std::vector<JpegSegment> segments, const JpegOptions& options = JpegOptions()) {
  return EncodeGreyJpeg(48, 32, 100, segments, options);
}

struct Reading {
  bool state;
  unsigned int level;
  bool operator==(const Reading& o) const { return state == o.state && level == o.level; }
};

void PrintTo(const Reading& r, std::ostream* os) {
  *os << "(" << (r.state ? "true" : "false") << ", " << r.level << ")";
}

// Captures stderr while alive; libjpeg must never write to it.
class StderrCapture {
 public:
  StderrCapture() { testing::internal::CaptureStderr(); }
  ~StderrCapture() {
    if (!taken_) testing::internal::GetCapturedStderr();
  }
  std::string Take() {
    taken_ = true;
    return testing::internal::GetCapturedStderr();
  }

 private:
  bool taken_ = false;
};

// A frame buffer in process memory.
class HeapBuffer {
 public:
  explicit HeapBuffer(uint32_t slots = 4, uint32_t capacity = 1 << 20)
      : memory_(new uint64_t[(StreamBuffer::RequiredBytes(slots, capacity) + 7) / 8]),
        buffer_(StreamBuffer::Format(memory_.get(), slots, capacity)) {}
  StreamBuffer* get() { return buffer_; }

 private:
  std::unique_ptr<uint64_t[]> memory_;
  StreamBuffer* buffer_;
};

using Factory = std::function<std::unique_ptr<JpgHdrDetector>(Camera*, StreamBuffer*, CameraAPI*)>;

Factory Jvc() {
  return [](Camera* c, StreamBuffer* b, CameraAPI* a) { return std::make_unique<JVCJpgMD>(c, b, a); };
}
Factory Vivotek(VIVO_FUNC_GR group) {
  return [group](Camera* c, StreamBuffer* b, CameraAPI* a) {
    return std::make_unique<VivotekJpgMD>(c, b, a, group);
  };
}
Factory Pana(EVENT_DET_TYPE type, PANA_FUNC_GR group) {
  return [type, group](Camera* c, StreamBuffer*, CameraAPI* a) {
    return std::make_unique<PanaJpgED>(c, a, type, group);
  };
}

class JpgHdrTest : public ::testing::Test {
 protected:
  CameraAPIRecord ApiRecord() const {
    CameraAPIRecord r;
    r.stream = StreamLocation{kOtherStream, cam_.Port()};
    r.streams[{1, 2}] = StreamLocation{kStream, cam_.Port()};
    return r;
  }

  // The camera pushes `frames` in turn (the last repeats) every 10 ms; with `close_after`
  // it ends the stream after that many frames.
  void Serve(std::vector<std::string> frames, int close_after = 0) {
    cam_.Handle(kStream, [frames, close_after](evsim::HttpConnection& connection) {
      MultipartWriter writer(connection, "frame");
      if (!writer.Begin()) return;
      for (size_t i = 0; close_after == 0 || static_cast<int>(i) < close_after; ++i) {
        const std::string& f = frames[i < frames.size() ? i : frames.size() - 1];
        if (!writer.Part("image/jpeg", f) || !connection.SleepFor(milliseconds(10))) return;
      }
    });
  }

  // DoED on a frame, with level preset to 77.
  Reading Parse(const Factory& make, const std::string& frame) {
    auto detector = make(&camera_, nullptr, &api_);
    std::string copy = frame;
    Reading r{false, 77};
    r.state = detector->DoED(copy.empty() ? nullptr : &copy[0], static_cast<int>(copy.size()), r.level);
    return r;
  }

  // The first report of a detector that reads `frame` from the camera's stream.
  Report ViaStream(const Factory& make, const std::string& frame) {
    Serve({frame});
    return FirstReport(make(&camera_, nullptr, &api_));
  }

  // The first report of a detector that reads `frame` from a frame buffer (after a skip).
  Report ViaBuffer(const Factory& make, const std::string& frame, uint32_t skip = 5) {
    HeapBuffer buffer;
    EXPECT_EQ(buffer.get()->Write(frame.data(), static_cast<uint32_t>(frame.size()), skip), 0);
    return FirstReport(make(&camera_, buffer.get(), nullptr));
  }

  Report FirstReport(std::unique_ptr<JpgHdrDetector> detector) {
    EventBuf events;
    EventRecorder recorder(events);
    EXPECT_EQ(detector->Init(&events, 500), 0);
    EXPECT_EQ(detector->Start(), 0);
    EXPECT_TRUE(recorder.WaitForCount(1));
    detector->Stop();
    std::vector<Report> reports = recorder.Reports();
    return reports.empty() ? Report{true, -1} : reports[0];
  }

  // Both ways a detector gets frames.
  void ExpectEveryWay(const Factory& make, const std::string& frame, Report expected) {
    EXPECT_EQ(ViaBuffer(make, frame), expected) << "from the frame buffer";
    EXPECT_EQ(ViaStream(make, frame), expected) << "from the stream";
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("viewer", "secret")};
  CameraAPI api_{ApiRecord()};
};

TEST_F(JpgHdrTest, FirstSavedSegmentDecidesEvenWhenAMatchingOneFollows) {
  // JVC: another program's comment comes first; the camera's flag follows in vain.
  const std::string jvc = Frame({{kCom, "made by an encoder"}, {kCom, JvcCom('1')}});
  EXPECT_EQ(Parse(Jvc(), jvc), (Reading{false, 0}));
  ExpectEveryWay(Jvc(), jvc, Report{false, 0});

  // Vivotek APP0: a JFIF 1.02 header is the first APP0; its byte 6 (0x02) has bit 0 clear.
  JpegOptions jfif;
  jfif.jfif = true;
  jfif.jfif_minor = 2;
  const std::string vivo = Frame({{kApp0, VivoApp0(0x01, 0x0F)}}, jfif);
  EXPECT_EQ(Parse(Vivotek(VIVO_FUNC_GR_APP0), vivo), (Reading{false, 0}));
  ExpectEveryWay(Vivotek(VIVO_FUNC_GR_APP0), vivo, Report{false, 0});

  // Vivotek APP2: an ICC profile segment first, without the tag.
  const std::string icc = Frame({{kApp2, "ICC_PROFILE" + std::string(40, '\x02')},
                                 {kApp2, VivoApp2(1, "\xC4\x80\x00\x00")}});
  EXPECT_FALSE(Parse(Vivotek(VIVO_FUNC_GR_APP2), icc).state);
  ExpectEveryWay(Vivotek(VIVO_FUNC_GR_APP2), icc, Report{false, 0});

  // Panasonic: a comment without the motion bytes comes first.
  const std::string pana = Frame({{kCom, "short"}, {kCom, PanaCom(0, 10, 30)}});
  EXPECT_EQ(Parse(Pana(EVENT_DET_MOTION, PANA_FUNC_GR_0), pana), (Reading{false, 0}));
  EXPECT_EQ(ViaStream(Pana(EVENT_DET_MOTION, PANA_FUNC_GR_0), pana), (Report{false, 0}));
}

TEST_F(JpgHdrTest, SegmentsOfOtherMarkersAreNeitherSavedNorJudged) {
  // An APP segment ahead of the COM is not kept, so the COM is the first saved segment.
  const std::string jvc = Frame({{kApp2, JvcCom('0')}, {kApp0, "x"}, {kCom, JvcCom('1')}});
  EXPECT_EQ(Parse(Jvc(), jvc), (Reading{true, 100}));
  ExpectEveryWay(Jvc(), jvc, Report{true, 100});
  // And a COM ahead of the APP0 is not the Vivotek record.
  const std::string vivo = Frame({{kCom, VivoApp0(0x00, 0)}, {kApp0, VivoApp0(0x01, 0x02)}});
  EXPECT_EQ(Parse(Vivotek(VIVO_FUNC_GR_APP0), vivo), (Reading{true, 18}));
}

TEST_F(JpgHdrTest, FrameWithoutTheMarkerIsNoEventAndLeavesTheLevel) {
  const std::string frame = Frame({{kApp0, "x"}});
  EXPECT_EQ(Parse(Jvc(), frame), (Reading{false, 77}));
  EXPECT_EQ(Parse(Pana(EVENT_DET_MOTION, PANA_FUNC_GR_0), frame), (Reading{false, 77}));
  ExpectEveryWay(Jvc(), frame, Report{false, 0});
}

TEST_F(JpgHdrTest, PanasonicMotionCompareAndScale) {
  const Factory motion = Pana(EVENT_DET_MOTION, PANA_FUNC_GR_0);
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 10, 30)}})), (Reading{true, 100}));
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 20, 15)}})), (Reading{false, 75}));
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 3, 3)}})), (Reading{false, 15}));
  // Unsigned bytes: 0x90 is 144, not a negative number.
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 10, 0x90)}})), (Reading{true, 100}));
  EXPECT_EQ(ViaStream(motion, Frame({{kCom, PanaCom(0, 10, 30)}})), (Report{true, 100}));
  EXPECT_EQ(ViaStream(motion, Frame({{kCom, PanaCom(0, 20, 15)}})), (Report{false, 75}));
}

TEST_F(JpgHdrTest, PanasonicMotionNeedsBytesTwelveAndThirteen) {
  const Factory motion = Pana(EVENT_DET_MOTION, PANA_FUNC_GR_0);
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 10, 30).substr(0, 13)}})), (Reading{false, 0}));
  EXPECT_EQ(Parse(motion, Frame({{kCom, PanaCom(0, 10, 30).substr(0, 14)}})), (Reading{true, 100}));
}

TEST_F(JpgHdrTest, PanasonicInputGroupOneReadsInverted) {
  const Factory input = Pana(EVENT_DET_INPUT, PANA_FUNC_GR_1);
  EXPECT_EQ(Parse(input, Frame({{kCom, PanaCom(0x80, 0, 0)}})), (Reading{true, 1}));
  EXPECT_EQ(Parse(input, Frame({{kCom, PanaCom(0xC0, 0, 0)}})), (Reading{false, 1}));
  EXPECT_EQ(Parse(input, Frame({{kCom, PanaCom(0x00, 0, 0)}})), (Reading{true, 1}));
  EXPECT_EQ(Parse(input, Frame({{kCom, PanaCom(0x40, 0, 0)}})), (Reading{true, 1}));
  EXPECT_EQ(ViaStream(input, Frame({{kCom, PanaCom(0x80, 0, 0)}})), (Report{true, 1}));
  EXPECT_EQ(ViaStream(input, Frame({{kCom, PanaCom(0xC0, 0, 0)}})), (Report{false, 1}));
  EXPECT_EQ(ViaStream(input, Frame({{kCom, PanaCom(0x00, 0, 0)}})), (Report{true, 1}));
}

TEST_F(JpgHdrTest, PanasonicInputGroupZeroAndOtherGroupsAndTypes) {
  const Factory group0 = Pana(EVENT_DET_INPUT, PANA_FUNC_GR_0);
  EXPECT_EQ(Parse(group0, Frame({{kCom, PanaCom(0x80, 0, 0)}})), (Reading{true, 1}));
  EXPECT_EQ(Parse(group0, Frame({{kCom, PanaCom(0x7F, 0, 0)}})), (Reading{false, 1}));
  // A one-byte segment is enough for the input bits.
  EXPECT_EQ(Parse(group0, Frame({{kCom, "\x80"}})), (Reading{true, 1}));
  const Factory group2 = Pana(EVENT_DET_INPUT, static_cast<PANA_FUNC_GR>(2));
  EXPECT_EQ(Parse(group2, Frame({{kCom, PanaCom(0x80, 0, 0)}})), (Reading{false, 1}));
  const Factory type2 = Pana(static_cast<EVENT_DET_TYPE>(2), PANA_FUNC_GR_0);
  EXPECT_EQ(Parse(type2, Frame({{kCom, PanaCom(0x80, 10, 30)}})), (Reading{false, 0}));
}

TEST_F(JpgHdrTest, VivotekApp0BitAndLevel) {
  const Factory app0 = Vivotek(VIVO_FUNC_GR_APP0);
  const std::string moving = Frame({{kApp0, VivoApp0(0x01, 0x0F)}});
  const std::string still = Frame({{kApp0, VivoApp0(0x00, 0x0F)}});
  EXPECT_EQ(Parse(app0, moving), (Reading{true, 96}));
  EXPECT_EQ(Parse(app0, still), (Reading{false, 0}));
  // Only the low nibble of byte 7 counts; bit 0 of byte 6 alone decides.
  EXPECT_EQ(Parse(app0, Frame({{kApp0, VivoApp0(0xFF, 0xF0)}})), (Reading{true, 6}));
  ExpectEveryWay(app0, moving, Report{true, 96});
  ExpectEveryWay(app0, still, Report{false, 0});
}

TEST_F(JpgHdrTest, VivotekApp0ShortRecords) {
  const Factory app0 = Vivotek(VIVO_FUNC_GR_APP0);
  EXPECT_EQ(Parse(app0, Frame({{kApp0, VivoApp0(0x01, 0x0F).substr(0, 6)}})), (Reading{false, 0}));
  // Byte 6 without a byte 7: the level nibble reads as 0.
  EXPECT_EQ(Parse(app0, Frame({{kApp0, VivoApp0(0x01, 0x0F).substr(0, 7)}})), (Reading{true, 6}));
}

TEST_F(JpgHdrTest, VivotekApp2CountZeroHasNoBits) {
  const Factory app2 = Vivotek(VIVO_FUNC_GR_APP2);
  const std::string empty = Frame({{kApp2, VivoApp2(0, "\xC4\x80\x00\x00")}});
  EXPECT_EQ(Parse(app2, empty), (Reading{false, 0}));
  ExpectEveryWay(app2, empty, Report{false, 0});
}

TEST_F(JpgHdrTest, VivotekApp2ValidTriggerAndLevel) {
  const Factory app2 = Vivotek(VIVO_FUNC_GR_APP2);
  // 0xC4 = valid, trigger, then 000100; 0x80 gives the level's last bit: 0b0001001 = 9.
  const std::string moving = Frame({{kApp2, VivoApp2(1, "\xC4\x80\x00\x00")}});
  EXPECT_EQ(Parse(app2, moving), (Reading{true, 9}));
  ExpectEveryWay(app2, moving, Report{true, 9});
  // The full 7 bits, uncapped.
  EXPECT_EQ(Parse(app2, Frame({{kApp2, VivoApp2(2, "\xFF\xFF\x00\x00\x00\x00\x00\x00")}})),
            (Reading{true, 127}));
  // Valid without trigger: no motion, but the level is written.
  const std::string still = Frame({{kApp2, VivoApp2(1, "\xBF\x00\x00\x00")}});
  EXPECT_EQ(Parse(app2, still), (Reading{false, 126}));
  ExpectEveryWay(app2, still, Report{false, 126});
  // Not valid: nothing.
  EXPECT_EQ(Parse(app2, Frame({{kApp2, VivoApp2(1, "\x7F\xFF\x00\x00")}})), (Reading{false, 0}));
}

TEST_F(JpgHdrTest, VivotekApp2TagAndRecordBounds) {
  const Factory app2 = Vivotek(VIVO_FUNC_GR_APP2);
  // The tag found after some other bytes.
  EXPECT_TRUE(Parse(app2, Frame({{kApp2, VivoApp2(1, "\xC0\x00\x00\x00", 40)}})).state);
  // No tag.
  EXPECT_EQ(Parse(app2, Frame({{kApp2, std::string(64, 'q')}})), (Reading{false, 0}));
  // A tag that starts four bytes before the end is not searched for.
  EXPECT_FALSE(Parse(app2, Frame({{kApp2, "abcdjpeg"}})).state);
  // The record's first byte must be inside the segment.
  const std::string cut = VivoApp2(1, "");
  EXPECT_EQ(Parse(app2, Frame({{kApp2, cut}})), (Reading{false, 0}));
  // A record that ends after its first byte: the level's last bit reads as 0.
  EXPECT_EQ(Parse(app2, Frame({{kApp2, VivoApp2(1, "\xFF")}})), (Reading{true, 126}));
}

TEST_F(JpgHdrTest, JvcByte233) {
  const std::string on = Frame({{kCom, JvcCom('1')}});
  const std::string off = Frame({{kCom, JvcCom('0')}});
  EXPECT_EQ(Parse(Jvc(), on), (Reading{true, 100}));
  EXPECT_EQ(Parse(Jvc(), off), (Reading{false, 0}));
  EXPECT_EQ(Parse(Jvc(), Frame({{kCom, JvcCom('2')}})), (Reading{false, 0}));
  EXPECT_EQ(Parse(Jvc(), Frame({{kCom, JvcCom('1', 234)}})), (Reading{true, 100}));
  ExpectEveryWay(Jvc(), on, Report{true, 100});
  ExpectEveryWay(Jvc(), off, Report{false, 0});
}

TEST_F(JpgHdrTest, JvcSegmentShorterThanPosition233IsNoEvent) {
  // 233 bytes: position 233 lies outside what the library saved.
  std::string shorter = std::string(233, '1');
  EXPECT_EQ(Parse(Jvc(), Frame({{kCom, shorter}})), (Reading{false, 0}));
  EXPECT_EQ(Parse(Jvc(), Frame({{kCom, "1"}})), (Reading{false, 0}));
  ExpectEveryWay(Jvc(), Frame({{kCom, shorter}}), Report{false, 0});
}

TEST_F(JpgHdrTest, SegmentLimitAndLongSegments) {
  // A segment of the largest size a marker can have is saved whole.
  std::string longest = JvcCom('1', evsim::kMaxSegmentPayload);
  EXPECT_EQ(Parse(Jvc(), Frame({{kCom, longest}})), (Reading{true, 100}));
}

TEST_F(JpgHdrTest, IsEventDetectedRejectsNullAndEmpty) {
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  unsigned int level = 77;
  EXPECT_FALSE(jvc.IsEventDetected(nullptr, 300, level));
  EXPECT_EQ(level, 77u);
  char byte = '1';
  EXPECT_FALSE(jvc.IsEventDetected(&byte, 0, level));
  EXPECT_EQ(level, 77u);
  PanaJpgED pana(&camera_, &api_, EVENT_DET_MOTION, PANA_FUNC_GR_0);
  EXPECT_FALSE(pana.IsEventDetected(nullptr, 30, level));
  EXPECT_EQ(level, 0u);
  VivotekJpgMD vivo(&camera_, nullptr, &api_, VIVO_FUNC_GR_APP0);
  level = 77;
  EXPECT_FALSE(vivo.IsEventDetected(nullptr, 30, level));
  EXPECT_EQ(level, 77u);
}

TEST_F(JpgHdrTest, DoEDRejectsMissingFrames) {
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  unsigned int level = 77;
  EXPECT_FALSE(jvc.DoED(nullptr, 100, level));
  char byte = 0;
  EXPECT_FALSE(jvc.DoED(&byte, 0, level));
  EXPECT_FALSE(jvc.DoED(&byte, -1, level));
  EXPECT_EQ(level, 77u);
}

TEST_F(JpgHdrTest, CorruptAndTruncatedFramesAreFalseAndSilent) {
  const std::string good = Frame({{kCom, JvcCom('1')}});
  StderrCapture err;
  std::mt19937 random(11);
  int parsed = 0;
  for (size_t cut = 1; cut < good.size(); cut += 3) {
    std::string frame = good.substr(0, cut);
    // Exactly sized, so that AddressSanitizer sees any read past the frame.
    std::unique_ptr<char[]> exact(new char[frame.size()]);
    std::copy(frame.begin(), frame.end(), exact.get());
    JVCJpgMD jvc(&camera_, nullptr, &api_);
    unsigned int level = 0;
    const bool state = jvc.DoED(exact.get(), static_cast<int>(frame.size()), level);
    // The header ends before the scan: once it is whole, the flag is read.
    parsed += state ? 1 : 0;
  }
  for (int round = 0; round < 200; ++round) {
    std::string bad = good;
    for (int flips = 0; flips < 3; ++flips) bad[random() % bad.size()] = static_cast<char>(random());
    Parse(Jvc(), bad);
  }
  std::string noise(600, '\0');
  for (char& c : noise) c = static_cast<char>(random());
  EXPECT_EQ(Parse(Jvc(), noise), (Reading{false, 77}));
  EXPECT_EQ(Parse(Jvc(), "\xFF\xD8\xFF\xFE\x00\x10" + JvcCom('1').substr(0, 6)), (Reading{false, 77}));
  EXPECT_EQ(err.Take(), "");
  EXPECT_GT(parsed, 0);
}

TEST_F(JpgHdrTest, CorruptFramesOverTheStreamReportFalseAndKeepReading) {
  const std::string good = Frame({{kCom, JvcCom('1')}});
  StderrCapture err;
  Serve({"not a jpeg at all", good.substr(0, good.size() / 3), good});
  EventBuf events;
  EventRecorder recorder(events);
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  ASSERT_EQ(jvc.Init(&events, 500), 0);
  ASSERT_EQ(jvc.Start(), 0);
  EXPECT_TRUE(recorder.WaitForReport(Report{true, 100}));
  jvc.Stop();
  std::vector<Report> reports = recorder.Reports();
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{false, 0}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{true, 100}));
  EXPECT_EQ(cam_.Count(kStream), 1) << "a bad frame is not a failed read";
  EXPECT_EQ(err.Take(), "");
}

TEST_F(JpgHdrTest, StreamModeAsksThePreparedStreamWithCredentials) {
  cam_.RequireAuth(evsim::AuthScheme::kDigest, "viewer", "secret");
  EXPECT_EQ(ViaStream(Jvc(), Frame({{kCom, JvcCom('1')}})), (Report{true, 100}));
  // PrepareStream(1, 2) picked the stream; the default one was never asked.
  EXPECT_EQ(cam_.Count(kOtherStream), 0);
  EXPECT_GE(cam_.Count(kStream), 1);
}

TEST_F(JpgHdrTest, FramesOfGrowingAndShrinkingSizeAreAllRead) {
  std::vector<unsigned char> pixels(640 * 480);
  std::mt19937 random(3);
  for (unsigned char& p : pixels) p = static_cast<unsigned char>(random());
  const std::string big =
      evsim::EncodeJpeg(evsim::JpegImage{pixels.data(), 640, 480, 1}, {{kCom, JvcCom('1')}});
  const std::string small_on = Frame({{kCom, JvcCom('1')}});
  const std::string small_off = Frame({{kCom, JvcCom('0')}});
  ASSERT_GT(big.size(), 10 * small_on.size());
  Serve({small_off, big, small_on, big, small_off, small_on});

  EventBuf events;
  EventRecorder recorder(events);
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  ASSERT_EQ(jvc.Init(&events, 500), 0);
  ASSERT_EQ(jvc.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(8));
  jvc.Stop();
  std::vector<Report> reports = recorder.Reports();
  const std::vector<Report> expected = {{false, 0}, {true, 100}, {true, 100}, {true, 100},
                                        {false, 0}, {true, 100}, {true, 100}};
  EXPECT_EQ(std::vector<Report>(reports.begin(), reports.begin() + 7), expected);
  EXPECT_EQ(cam_.Count(kStream), 1);
}

TEST_F(JpgHdrTest, FailedReadDropsTheReaderAndTheNextOneComesAfterTheBackOff) {
  const std::string frame = Frame({{kCom, JvcCom('1')}});
  EventBuf events;
  EventRecorder recorder(events);
  // How many reports the detector had made when each connection came.
  std::vector<size_t> reports_at_connect;
  std::mutex mutex;
  cam_.Handle(kStream, [&](evsim::HttpConnection& connection) {
    {
      std::lock_guard<std::mutex> lock(mutex);
      reports_at_connect.push_back(recorder.Size());
    }
    MultipartWriter writer(connection, "frame");
    if (writer.Begin()) writer.Part("image/jpeg", frame);
  });
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  ASSERT_EQ(jvc.Init(&events, 500), 0);
  ASSERT_EQ(jvc.Start(), 0);
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.size() >= 3; },
                               seconds(30)));
  jvc.Stop();
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 100}));
  EXPECT_EQ(reports[1], (Report{false, 0})) << "the failed read, after its back-off";
  EXPECT_EQ(reports[2], (Report{true, 100})) << "a new reader, a new connection";
  std::lock_guard<std::mutex> lock(mutex);
  ASSERT_GE(reports_at_connect.size(), 2u);
  EXPECT_EQ(reports_at_connect[0], 0u);
  EXPECT_EQ(reports_at_connect[1], 2u) << "the second connection came only after the back-off";
}

TEST_F(JpgHdrTest, StopDuringTheBackOffEndsItEarly) {
  // Two detectors whose cameras refuse the stream: the first is stopped during its back-off,
  // the second keeps waiting out its own, which is the measure of "early".
  FakeCamera other;
  Camera other_camera(other.Record());
  CameraAPIRecord other_record;
  other_record.stream = StreamLocation{kStream, other.Port()};
  CameraAPI other_api(other_record);

  EventBuf events, other_events;
  EventRecorder recorder(events);
  EventRecorder other_recorder(other_events);
  JVCJpgMD stopped(&camera_, nullptr, &api_);
  JVCJpgMD control(&other_camera, nullptr, &other_api);
  ASSERT_EQ(control.Init(&other_events, 500), 0);
  ASSERT_EQ(stopped.Init(&events, 500), 0);
  ASSERT_EQ(control.Start(), 0);
  ASSERT_TRUE(other.WaitForRequests(1));
  ASSERT_EQ(stopped.Start(), 0);
  ASSERT_TRUE(cam_.WaitForRequests(1));

  EXPECT_EQ(stopped.Stop(), 0);
  // The control detector is still in the back-off that began before the stopped one's.
  EXPECT_EQ(other.Count(kStream), 1);
  EXPECT_EQ(other_recorder.Size(), 0u);
  EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 0}, {false, 0}}));
  EXPECT_EQ(cam_.Count(kStream), 1);
  control.Stop();
  EXPECT_EQ(other_recorder.Reports(), (std::vector<Report>{{false, 0}, {false, 0}}));
}

TEST_F(JpgHdrTest, BufferModeReportsEveryPassAndReleasesEachUnit) {
  // Two slots: a unit that was never released would leave the writer nowhere to write.
  HeapBuffer buffer(2, 1 << 16);
  const std::string on = Frame({{kCom, JvcCom('1')}});
  const std::string off = Frame({{kCom, JvcCom('0')}});
  EventBuf events;
  EventRecorder recorder(events);
  JVCJpgMD jvc(&camera_, buffer.get(), nullptr);
  ASSERT_EQ(jvc.Init(&events, 500), 0);
  ASSERT_EQ(buffer.get()->Write(on.data(), static_cast<uint32_t>(on.size())), 0);
  ASSERT_EQ(jvc.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  // No new unit: the passes go on at frame pace, each reporting (false, 0).
  ASSERT_TRUE(recorder.WaitForCount(recorder.Size() + 3));
  for (int round = 0; round < 4; ++round) {
    const std::string& frame = round % 2 == 0 ? off : on;
    ASSERT_EQ(buffer.get()->Write(frame.data(), static_cast<uint32_t>(frame.size()), round), 0);
    const size_t seen = recorder.Size();
    ASSERT_TRUE(recorder.WaitForCount(seen + 3));
  }
  jvc.Stop();
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{true, 100}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Count(kStream) + cam_.Count(kOtherStream), 0) << "buffer mode opens no stream";
  int on_reports = 0;
  for (const Report& r : reports) on_reports += r == Report{true, 100} ? 1 : 0;
  EXPECT_EQ(on_reports, 3) << "each unit is judged once";
}

TEST_F(JpgHdrTest, BufferUnitWithAFalseLengthIsNotRead) {
  HeapBuffer buffer(4, 4096);
  const std::string on = Frame({{kCom, JvcCom('1')}});
  ASSERT_EQ(buffer.get()->Write(on.data(), static_cast<uint32_t>(on.size())), 0);
  DataUnit* unit = buffer.get()->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  // A record that another process wrote wrongly: a skip beyond its length.
  unit->skip = unit->length + 1;
  buffer.get()->ReadFinish(unit, false);
  EXPECT_EQ(FirstReport(std::make_unique<JVCJpgMD>(&camera_, buffer.get(), nullptr)), (Report{false, 0}));
}

// Sends the syslog lines of its lifetime to stderr as well, and captures stderr.
class LogCapture {
 public:
  LogCapture() {
    openlog("jpghdrdetector_test", LOG_PERROR, LOG_USER);
    testing::internal::CaptureStderr();
  }
  ~LogCapture() {
    if (!taken_) testing::internal::GetCapturedStderr();
    closelog();
  }
  std::string Take() {
    taken_ = true;
    return testing::internal::GetCapturedStderr();
  }

 private:
  bool taken_ = false;
};

// Runs a detector that cannot work until its thread has ended; returns its reports.
std::vector<Report> RunToEnd(JpgHdrDetector& detector) {
  EventBuf events;
  EventRecorder recorder(events);
  EXPECT_EQ(detector.Init(&events, 500), 0);
  EXPECT_EQ(detector.Start(), 0);
  EXPECT_TRUE(recorder.WaitForCount(1));
  EXPECT_TRUE(detector.IsStarted());
  EXPECT_EQ(detector.Stop(), 0);
  return recorder.Reports();
}

TEST_F(JpgHdrTest, NullCameraIsLoggedAndReportedOnce) {
  LogCapture log;
  JVCJpgMD jvc(nullptr, nullptr, &api_);
  EXPECT_EQ(RunToEnd(jvc), (std::vector<Report>{{false, 0}}));
  const std::string text = log.Take();
  EXPECT_NE(text.find("jpghdrdetector:"), std::string::npos) << text;
  EXPECT_NE(text.find(":EventDetecor(): Null camera object"), std::string::npos) << text;
  EXPECT_EQ(cam_.Requests().size(), 0u);
}

TEST_F(JpgHdrTest, NullCameraApiInStreamModeIsLoggedAndReportedOnce) {
  LogCapture log;
  VivotekJpgMD vivo(&camera_, nullptr, nullptr, VIVO_FUNC_GR_APP0);
  EXPECT_EQ(RunToEnd(vivo), (std::vector<Report>{{false, 0}}));
  const std::string text = log.Take();
  EXPECT_NE(text.find("jpghdrdetector:"), std::string::npos) << text;
  EXPECT_NE(text.find(":EventDetecor(): Null camera api"), std::string::npos) << text;
  EXPECT_EQ(cam_.Requests().size(), 0u);
}

TEST_F(JpgHdrTest, BufferModeNeedsNoCameraApi) {
  LogCapture log;
  EXPECT_EQ(ViaBuffer(Vivotek(VIVO_FUNC_GR_APP0), Frame({{kApp0, VivoApp0(1, 3)}})),
            (Report{true, 24}));
  EXPECT_EQ(log.Take(), "");
}

// A camera API without streams that counts how often it is asked for one.
class NoStreamApi : public CameraAPI {
 public:
  NoStreamApi() : CameraAPI(CameraAPIRecord{}) {}
  int GetStreamPath(std::string& path, int& port) override {
    ++asked;
    return CameraAPI::GetStreamPath(path, port);
  }
  std::atomic<int> asked{0};
};

TEST_F(JpgHdrTest, NoStreamPathMeansNoReaderAndABackOff) {
  NoStreamApi no_streams;
  JVCJpgMD jvc(&camera_, nullptr, &no_streams);
  EventBuf events;
  EventRecorder recorder(events);
  ASSERT_EQ(jvc.Init(&events, 500), 0);
  ASSERT_EQ(jvc.Start(), 0);
  while (no_streams.asked == 0) std::this_thread::sleep_for(milliseconds(1));
  // Without the back-off the loop would ask again every 16 ms.
  std::this_thread::sleep_for(milliseconds(300));
  jvc.Stop();
  EXPECT_EQ(no_streams.asked, 1);
  EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 0}, {false, 0}}));
  EXPECT_EQ(cam_.Requests().size(), 0u);
}

// A fetcher that records what is asked of it.
class ScriptedFetcher : public FetcherBase {
 public:
  int header_result = 0;
  int body_result = 0;
  int header_size = 0;
  int skipped = 0;
  int bodies = 0;
  int ReadPartHeader(int* length, char*, int size) override {
    header_size = size;
    *length = 42;
    return header_result;
  }
  int ReadPartBody(char*, int) override {
    ++bodies;
    return body_result;
  }
  int SkipContent(char*, int) override {
    ++skipped;
    return 0;
  }
};

TEST_F(JpgHdrTest, GetImageLenAndFetchImageMapResults) {
  JVCJpgMD jvc(&camera_, nullptr, &api_);
  ScriptedFetcher f;
  int length = 0;
  EXPECT_EQ(jvc.GetImageLen(&f, &length), 0);
  EXPECT_EQ(length, 42);
  EXPECT_EQ(f.header_size, 128);
  f.header_result = 3;
  EXPECT_EQ(jvc.GetImageLen(&f, &length), -1);
  EXPECT_EQ(jvc.GetImageLen(nullptr, &length), -1);
  EXPECT_EQ(jvc.GetImageLen(&f, nullptr), -1);

  char buffer[8];
  EXPECT_EQ(jvc.FetchImage(&f, buffer, 8), 0);
  EXPECT_EQ(f.bodies, 1);
  f.body_result = 1;
  EXPECT_EQ(jvc.FetchImage(&f, buffer, 8), -1);
  EXPECT_EQ(jvc.FetchImage(nullptr, buffer, 8), -1);
  EXPECT_EQ(f.skipped, 0);
  EXPECT_EQ(jvc.FetchImage(&f, nullptr, 8), -1);
  EXPECT_EQ(jvc.FetchImage(&f, buffer, 0), -1);
  EXPECT_EQ(f.skipped, 2);
  EXPECT_EQ(f.bodies, 2);
}

TEST_F(JpgHdrTest, DeletingAStartedDetectorStopsIt) {
  Serve({Frame({{kCom, JvcCom('1')}})});
  EventBuf events;
  EventRecorder recorder(events);
  {
    auto jvc = std::make_unique<JVCJpgMD>(&camera_, nullptr, &api_);
    ASSERT_EQ(jvc->Init(&events, 500), 0);
    ASSERT_EQ(jvc->Start(), 0);
    ASSERT_TRUE(recorder.WaitForReport(Report{true, 100}));
  }
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

}  // namespace
