#include "detectors/ipux.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::MultipartWriter;
using evtest::Report;
using std::chrono::milliseconds;

const char kMotionStream[] = "/cgi-bin/status.cgi?kind=motion";
const char kInputStream[] = "/cgi-bin/status.cgi?kind=input";
const int kVideoType = 3;

// A status record of `size` bytes with the sensitivity byte 24 and the flags byte 27 (when
// the record is long enough to have them).
std::string Record(unsigned char sensitivity, unsigned char flags, size_t size = 32) {
  std::string r(size, '\0');
  if (size > 24) r[24] = static_cast<char>(sensitivity);
  if (size > 27) r[27] = static_cast<char>(flags);
  return r;
}

// A frame buffer in process memory.
class HeapBuffer {
 public:
  explicit HeapBuffer(uint32_t slots = 4, uint32_t capacity = 1 << 16)
      : memory_(new uint64_t[(StreamBuffer::RequiredBytes(slots, capacity) + 7) / 8]),
        buffer_(StreamBuffer::Format(memory_.get(), slots, capacity)) {}
  StreamBuffer* get() { return buffer_; }

 private:
  std::unique_ptr<uint64_t[]> memory_;
  StreamBuffer* buffer_;
};

// A camera API that counts GetMDParams calls and notes how many reports the detector had
// made at each, and whose threshold the test can change.
class CountingApi : public CameraAPI {
 public:
  CountingApi(CameraAPIRecord record, EventBuf* events) : CameraAPI(std::move(record)), events_(events) {}
  int GetMDParams(int& p1, int& p2, int& p3, int& p4) override {
    CameraAPI::GetMDParams(p1, p2, p3, p4);
    p2 = threshold;
    std::lock_guard<std::mutex> lock(mutex_);
    reports_at_call_.push_back(events_->Count());
    return 0;
  }
  std::vector<uint64_t> ReportsAtCall() {
    std::lock_guard<std::mutex> lock(mutex_);
    return reports_at_call_;
  }
  std::atomic<int> threshold{90};

 private:
  EventBuf* events_;
  std::mutex mutex_;
  std::vector<uint64_t> reports_at_call_;
};

class IPuxTest : public ::testing::Test {
 protected:
  CameraAPIRecord ApiRecord(int threshold = 90) const {
    CameraAPIRecord r;
    r.streams[{kVideoType, 2}] = StreamLocation{kMotionStream, cam_.Port()};
    r.streams[{kVideoType, 1}] = StreamLocation{kInputStream, cam_.Port()};
    r.md_params = {{50, threshold, 7, 8}};
    return r;
  }

  // The camera pushes `records` in turn on target (the last repeats) every 5 ms.
  void Serve(const std::string& target, std::vector<std::string> records) {
    cam_.Handle(target, [records](evsim::HttpConnection& connection) {
      MultipartWriter writer(connection, "status");
      if (!writer.Begin()) return;
      for (size_t i = 0;; ++i) {
        const std::string& r = records[i < records.size() ? i : records.size() - 1];
        if (!writer.Part("application/octet-stream", r) || !connection.SleepFor(milliseconds(5))) return;
      }
    });
  }

  std::unique_ptr<MultipartFetch> Reader(const std::string& target) {
    return std::make_unique<MultipartFetch>("127.0.0.1", cam_.Port(), target.c_str(), "", "", 10);
  }

  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  // DoMD on the first part of a stream of `record`.
  Reading ReadMotion(const std::string& record) {
    Serve(kMotionStream, {record});
    auto reader = Reader(kMotionStream);
    IPuxMD md(&camera_, &api_, nullptr);
    Reading r{7, true, 77};
    r.result = md.DoMD(reader.get(), r.state, r.level);
    return r;
  }
  Reading ReadInput(const std::string& record) {
    Serve(kInputStream, {record});
    auto reader = Reader(kInputStream);
    IPuxEID eid(&camera_, &api_, 1, nullptr);
    Reading r{7, true, 0};
    r.result = eid.DoEID(reader.get(), r.state);
    return r;
  }

  // Runs a detector until `count` reports have come; returns them.
  std::vector<Report> Run(DetectorBase& detector, EventBuf& events, size_t count) {
    EventRecorder recorder(events);
    EXPECT_EQ(detector.Init(&events, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitForCount(count));
    detector.Stop();
    return recorder.Reports();
  }

  // The first report of IPuxMD over the stream, with the API's threshold.
  Report MotionViaStream(const std::string& record, int threshold) {
    Serve(kMotionStream, {record});
    CameraAPI api(ApiRecord(threshold));
    IPuxMD md(&camera_, &api, nullptr);
    EventBuf events;
    return Run(md, events, 1)[0];
  }
  // The first report of IPuxMD from a frame buffer holding `record`.
  Report MotionViaBuffer(const std::string& record, int threshold, uint32_t skip = 0) {
    HeapBuffer buffer;
    EXPECT_EQ(buffer.get()->Write(record.data(), static_cast<uint32_t>(record.size()), skip), 0);
    CameraAPI api(ApiRecord(threshold));
    IPuxMD md(&camera_, &api, buffer.get());
    EventBuf events;
    return Run(md, events, 1)[0];
  }
  Report InputViaStream(const std::string& record) {
    Serve(kInputStream, {record});
    IPuxEID eid(&camera_, &api_, 1, nullptr);
    EventBuf events;
    return Run(eid, events, 1)[0];
  }
  Report InputViaBuffer(const std::string& record, uint32_t skip = 0) {
    HeapBuffer buffer;
    EXPECT_EQ(buffer.get()->Write(record.data(), static_cast<uint32_t>(record.size()), skip), 0);
    IPuxEID eid(&camera_, &api_, 1, buffer.get());
    EventBuf events;
    return Run(eid, events, 1)[0];
  }

  FakeCamera cam_;
  Camera camera_{[this] {
    CameraRecord r = cam_.Record();
    r.video_type = kVideoType;
    return r;
  }()};
  CameraAPI api_{ApiRecord()};
};

TEST(SenStrToIntTest, ScalesARawByteToAPercentage) {
  EXPECT_EQ(SenStrToInt(0), 0);
  EXPECT_EQ(SenStrToInt(1), 1);
  EXPECT_EQ(SenStrToInt(2), 1);
  EXPECT_EQ(SenStrToInt(3), 2);
  EXPECT_EQ(SenStrToInt(127), 50);
  EXPECT_EQ(SenStrToInt(230), 89);
  EXPECT_EQ(SenStrToInt(231), 90);
  EXPECT_EQ(SenStrToInt(233), 90);
  EXPECT_EQ(SenStrToInt(234), 91);
  EXPECT_EQ(SenStrToInt(255), 99);
}

TEST_F(IPuxTest, PartOf28BytesIsNoMotionAndNoInput) {
  const std::string short_record = Record(255, 0x03, 28);
  Reading m = ReadMotion(short_record);
  EXPECT_EQ(m.result, 0);
  EXPECT_FALSE(m.state);
  EXPECT_EQ(m.level, 0u);
  Reading i = ReadInput(short_record);
  EXPECT_EQ(i.result, 0);
  EXPECT_FALSE(i.state);
  EXPECT_EQ(MotionViaStream(short_record, 1), (Report{false, 0}));
  EXPECT_EQ(MotionViaBuffer(short_record, 1), (Report{false, 0}));
  EXPECT_EQ(InputViaStream(short_record), (Report{false, 1}));
  EXPECT_EQ(InputViaBuffer(short_record), (Report{false, 1}));
}

TEST_F(IPuxTest, ShortRecordLeavesTheLevelUntouched) {
  IPuxMD md(&camera_, &api_, nullptr);
  std::string record = Record(255, 0, 28);
  unsigned int level = 77;
  EXPECT_FALSE(md.IsMotionDetected(&record[0], 28, level));
  EXPECT_EQ(level, 77u);
  EXPECT_FALSE(md.IsMotionDetected(nullptr, 40, level));
  EXPECT_EQ(level, 77u);
  record = Record(255, 0, 29);
  EXPECT_TRUE(md.IsMotionDetected(&record[0], 29, level));
  EXPECT_EQ(level, 99u);
}

TEST_F(IPuxTest, Byte24Of255AgainstThresholds90And99) {
  const std::string record = Record(255, 0);
  EXPECT_EQ(MotionViaStream(record, 90), (Report{true, 99}));
  // From the stream the level goes with the reading, motion or not.
  EXPECT_EQ(MotionViaStream(record, 99), (Report{false, 99}));
  EXPECT_EQ(MotionViaBuffer(record, 90), (Report{true, 99}));
  EXPECT_EQ(MotionViaBuffer(record, 99), (Report{false, 0}));
  // The threshold at construction is 90.
  IPuxMD md(&camera_, &api_, nullptr);
  EXPECT_EQ(md.Threshold(), 90);
  Reading r = ReadMotion(record);
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 99u);
}

TEST_F(IPuxTest, StreamReadingBelowTheThresholdCarriesItsLevel) {
  // DoMD passes the level of a reading that is not motion; the loop reports it as it is.
  Reading r = ReadMotion(Record(127, 0));
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 50u);
  EXPECT_EQ(MotionViaStream(Record(127, 0), 90), (Report{false, 50}));
  // From the buffer a reading that is not motion is reported as (false, 0).
  EXPECT_EQ(MotionViaBuffer(Record(127, 0), 90), (Report{false, 0}));
}

TEST_F(IPuxTest, ThresholdBelowOneCountsAsOne) {
  // Byte 24 = 2 gives 1, which is not above 1; byte 24 = 3 gives 2, which is.
  EXPECT_EQ(MotionViaBuffer(Record(2, 0), 0), (Report{false, 0}));
  EXPECT_EQ(MotionViaBuffer(Record(2, 0), -5), (Report{false, 0}));
  EXPECT_EQ(MotionViaBuffer(Record(3, 0), 0), (Report{true, 2}));
  EXPECT_EQ(MotionViaStream(Record(2, 0), 0), (Report{false, 1}));
}

TEST_F(IPuxTest, Byte27Bit0IsTheInput) {
  EXPECT_TRUE(ReadInput(Record(0, 0x03)).state);
  EXPECT_FALSE(ReadInput(Record(0, 0x02)).state);
  EXPECT_EQ(ReadInput(Record(0, 0x02)).result, 0);
  EXPECT_EQ(InputViaStream(Record(0, 0x03)), (Report{true, 1}));
  EXPECT_EQ(InputViaStream(Record(0, 0x02)), (Report{false, 1}));
  EXPECT_EQ(InputViaBuffer(Record(0, 0x03)), (Report{true, 1}));
  EXPECT_EQ(InputViaBuffer(Record(0, 0x02)), (Report{false, 1}));
  IPuxEID eid(&camera_, &api_, 1, nullptr);
  std::string record = Record(0, 0x01, 29);
  bool input = false;
  eid.QueryCamera(&record[0], 29, input);
  EXPECT_TRUE(input);
  eid.QueryCamera(&record[0], 28, input);
  EXPECT_FALSE(input);
  input = true;
  eid.QueryCamera(nullptr, 29, input);
  EXPECT_FALSE(input);
}

TEST_F(IPuxTest, PartOf2000BytesIsReadIntoTheHeapAndParsedTheSame) {
  const std::string long_record = Record(255, 0x01, 2000);
  Reading m = ReadMotion(long_record);
  EXPECT_EQ(m.result, 0);
  EXPECT_TRUE(m.state);
  EXPECT_EQ(m.level, 99u);
  Reading i = ReadInput(long_record);
  EXPECT_EQ(i.result, 0);
  EXPECT_TRUE(i.state);
  EXPECT_EQ(MotionViaBuffer(long_record, 90), (Report{true, 99}));
  EXPECT_EQ(InputViaBuffer(long_record), (Report{true, 1}));
}

TEST_F(IPuxTest, FailedReadIsMinusOneAndTheReaderIsKept) {
  IPuxMD md(&camera_, &api_, nullptr);
  bool state = true;
  unsigned int level = 5;
  EXPECT_EQ(md.DoMD(nullptr, state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  IPuxEID eid(&camera_, &api_, 1, nullptr);
  EXPECT_EQ(eid.DoEID(nullptr, state), -1);

  // The camera refuses the first connection and streams on the second: one reader serves
  // both (it reconnects by itself), reporting (false, 0) for the failed pass.
  cam_.AnswerSequence(kInputStream, {evtest::Respond(500, "text/plain", "busy\r\n")});
  EventBuf events;
  EventRecorder recorder(events);
  ASSERT_EQ(eid.Init(&events, 500), 0);
  ASSERT_EQ(eid.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(1));
  Serve(kInputStream, {Record(0, 0x01)});
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  eid.Stop();
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.front(), (Report{false, 0}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Count(kInputStream), 2);
}

TEST_F(IPuxTest, EachDetectorPreparesItsOwnStream) {
  // Motion asks (video type, 2), input (video type, its int): the two paths differ.
  Serve(kMotionStream, {Record(255, 0)});
  Serve(kInputStream, {Record(0, 1)});
  IPuxMD md(&camera_, &api_, nullptr);
  IPuxEID eid(&camera_, &api_, 1, nullptr);
  EventBuf md_events, eid_events;
  EXPECT_EQ(Run(md, md_events, 1)[0], (Report{true, 99}));
  EXPECT_EQ(Run(eid, eid_events, 1)[0], (Report{true, 1}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kMotionStream, kInputStream}));

  // Another int picks another stream: here none is configured for it, so the default.
  CameraAPIRecord record = ApiRecord();
  record.stream = StreamLocation{"/default-stream", cam_.Port()};
  CameraAPI api(record);
  Serve("/default-stream", {Record(0, 1)});
  IPuxEID other(&camera_, &api, 4, nullptr);
  EventBuf other_events;
  EXPECT_EQ(Run(other, other_events, 1)[0], (Report{true, 1}));
  EXPECT_EQ(cam_.Count("/default-stream"), 1);
}

TEST_F(IPuxTest, ThresholdIsReadAgainEvery101Passes) {
  HeapBuffer buffer;
  const std::string record = Record(255, 0);
  ASSERT_EQ(buffer.get()->Write(record.data(), static_cast<uint32_t>(record.size())), 0);
  EventBuf events;
  EventRecorder recorder(events);
  CountingApi api(ApiRecord(), &events);
  api.threshold = 99;
  IPuxMD md(&camera_, &api, buffer.get());
  ASSERT_EQ(md.Init(&events, 500), 0);
  ASSERT_EQ(md.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(50));
  // The camera's setting changes; the detector sees it at its next reading of the threshold.
  api.threshold = 90;
  ASSERT_TRUE(recorder.WaitForCount(101 + 5));
  ASSERT_EQ(buffer.get()->Write(record.data(), static_cast<uint32_t>(record.size())), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 99}));
  ASSERT_TRUE(recorder.WaitForCount(2 * 101 + 2));
  md.Stop();
  std::vector<uint64_t> at = api.ReportsAtCall();
  ASSERT_GE(at.size(), 3u);
  EXPECT_EQ(at[0], 0u);
  for (size_t i = 1; i < at.size(); ++i) EXPECT_EQ(at[i], 101u * i) << "call " << i;
  // Before the second reading the record of byte 255 was not motion (threshold 99).
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{false, 0}));
  for (size_t i = 0; i < 101; ++i) EXPECT_FALSE(reports[i].state) << i;
}

TEST_F(IPuxTest, BufferRecordsHaveNoLeadingSkip) {
  // The unit's skip bytes are read as the start of the record: a record written after a
  // skip of 3 has its byte 21 where the detector reads byte 24.
  std::string record = Record(0, 0);
  record[21] = static_cast<char>(255);
  record[24] = 0;
  EXPECT_EQ(MotionViaBuffer(record, 90, 3), (Report{true, 99}));
  EXPECT_EQ(MotionViaBuffer(record, 90, 0), (Report{false, 0}));
  std::string flags = Record(0, 0);
  flags[24] = 0x01;
  EXPECT_EQ(InputViaBuffer(flags, 3), (Report{true, 1}));
  EXPECT_EQ(InputViaBuffer(flags, 0), (Report{false, 1}));
}

TEST_F(IPuxTest, BufferWithoutANewRecordReportsFalseEachPass) {
  HeapBuffer buffer;
  const std::string record = Record(255, 0x01);
  ASSERT_EQ(buffer.get()->Write(record.data(), static_cast<uint32_t>(record.size())), 0);
  IPuxMD md(&camera_, &api_, buffer.get());
  EventBuf events;
  std::vector<Report> reports = Run(md, events, 4);
  EXPECT_EQ(reports[0], (Report{true, 99}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{false, 0}));
  IPuxEID eid(&camera_, &api_, 1, buffer.get());
  EventBuf eid_events;
  reports = Run(eid, eid_events, 3);
  EXPECT_EQ(reports[0], (Report{true, 1}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(cam_.Requests().size(), 0u) << "buffer mode opens no stream";
}

// Runs a detector that must end at once; its reports after Stop.
std::vector<Report> StartAndStop(DetectorBase& detector) {
  EventBuf events;
  EventRecorder recorder(events);
  EXPECT_EQ(detector.Init(&events, 500), 0);
  EXPECT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  EXPECT_EQ(detector.Stop(), 0);
  return recorder.Reports();
}

TEST_F(IPuxTest, MissingCameraApiOrStreamEndsTheThreadWithoutAReport) {
  HeapBuffer buffer;
  IPuxMD no_camera(nullptr, &api_, buffer.get());
  EXPECT_TRUE(StartAndStop(no_camera).empty());
  IPuxMD no_api(&camera_, nullptr, buffer.get());
  EXPECT_TRUE(StartAndStop(no_api).empty());
  CameraAPI no_streams{CameraAPIRecord{}};
  IPuxMD no_stream(&camera_, &no_streams, buffer.get());
  EXPECT_TRUE(StartAndStop(no_stream).empty());
  IPuxEID eid_no_camera(nullptr, &api_, 1, nullptr);
  EXPECT_TRUE(StartAndStop(eid_no_camera).empty());
  IPuxEID eid_no_api(&camera_, nullptr, 1, nullptr);
  EXPECT_TRUE(StartAndStop(eid_no_api).empty());
  IPuxEID eid_no_stream(&camera_, &no_streams, 1, nullptr);
  EXPECT_TRUE(StartAndStop(eid_no_stream).empty());
  EXPECT_EQ(cam_.Requests().size(), 0u);
}

TEST_F(IPuxTest, StopEndsWithAFinalFalse) {
  Serve(kMotionStream, {Record(255, 0)});
  IPuxMD md(&camera_, &api_, nullptr);
  EventBuf events;
  std::vector<Report> reports = Run(md, events, 3);
  EXPECT_EQ(reports[0], (Report{true, 99}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Count(kMotionStream), 1) << "one reader for the whole loop";
}

}  // namespace
