#include "detectors/ipux.h"

#include <memory>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"
#include "framework/polledloop.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

const int kPeriod = 16000;         // record pace, in microseconds
const int kRefreshPasses = 100;    // the threshold is read again once the count exceeds it
const int kMotionStream = 2;       // second PrepareStream value of the motion records
const int kMinRecord = 29;         // bytes a record needs to carry the readings
const int kSensitivityAt = 24;
const int kInputAt = 27;

// Where a loop reads its records: with a buffer nothing is opened; else the camera's stream
// that the camera API gives for (a, b). False when the API has no stream path (or the reader
// could not be made).
bool OpenRecords(Camera* camera, CameraAPI* api, int a, int b, StreamBuffer* buffer,
                 std::unique_ptr<MultipartFetch>* reader) {
  api->PrepareStream(a, b);
  std::string path;
  int port = 80;
  if (api->GetStreamPath(path, port) != 0) return false;
  if (buffer != nullptr) return true;
  *reader = OpenPartStream(*camera, path, port);
  return *reader != nullptr;
}

// Reads the next part of reader into a stack or heap buffer and hands it to judge(record,
// length). 0, or -1 when the part could not be read (its body skipped).
template <typename Judge>
int ReadRecord(MultipartFetch* reader, Judge&& judge) {
  if (reader == nullptr) return -1;
  StreamPart part;
  switch (part.Read(reader, false)) {
    case StreamPart::kRead:
      judge(part.Body(), part.Length());
      return 0;
    case StreamPart::kNoHeader:
      reader->SkipContent(part.Body(), 0);
      return -1;
    case StreamPart::kNoBody:
      return -1;
  }
  return -1;
}

// The newest record of the buffer, handed to judge(record, length) (null and 0 when there
// is no new one); the unit is released before returning. The record starts right after the
// unit's head and spans its whole data length: these units carry no leading skip.
template <typename Judge>
void ReadBufferRecord(StreamBuffer* buffer, DataUnit*& previous, Judge&& judge) {
  DataUnit* unit = buffer->ReadLatest(previous);
  if (unit == nullptr) {
    judge(nullptr, 0);
    return;
  }
  // The buffer may be shared with other processes: a length beyond the slot is not trusted.
  if (unit->length <= buffer->SlotCapacity()) {
    judge(reinterpret_cast<char*>(unit) + DataUnit::kHeadSize, static_cast<int>(unit->length));
  } else {
    judge(nullptr, 0);
  }
  buffer->ReadFinish(unit, false);
  previous = unit;
}

}  // namespace

int SenStrToInt(int x) { return static_cast<int>((x + 1) * 99 * (1.0 / 256) + 0.5); }

IPuxMD::IPuxMD(Camera* camera, CameraAPI* api, StreamBuffer* buffer)
    : threshold_(90), camera_(camera), api_(api), buffer_(buffer) {}

IPuxMD::~IPuxMD() { StopIfStarted(); }

bool IPuxMD::IsMotionDetected(char* record, int length, unsigned int& level) {
  if (record == nullptr || length < kMinRecord) return false;
  const int percent = SenStrToInt(static_cast<unsigned char>(record[kSensitivityAt]));
  level = static_cast<unsigned int>(percent > 100 ? 100 : percent);
  return static_cast<int>(level) > threshold_;
}

int IPuxMD::DoMD(MultipartFetch* reader, bool& state, unsigned int& level) {
  state = false;
  level = 0;
  return ReadRecord(reader, [&](char* record, int length) {
    state = IsMotionDetected(record, length, level);
  });
}

void IPuxMD::RefreshThreshold() {
  int params[3] = {0, 0, 0};
  api_->GetMDParams(params[0], threshold_, params[1], params[2]);
  if (threshold_ < 1) threshold_ = 1;
}

int IPuxMD::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  RefreshThreshold();
  std::unique_ptr<MultipartFetch> reader;
  if (!OpenRecords(camera_, api_, camera_->GetVideoType(), kMotionStream, buffer_, &reader)) {
    return 0;
  }
  int passes = 0;
  DataUnit* previous = nullptr;
  RunPolledLoop(*this, event_buffer_, kPeriod, [&]() -> PassReport {
    if (passes > kRefreshPasses) {
      RefreshThreshold();
      passes = 0;
    }
    ++passes;
    if (reader != nullptr) {
      bool state = false;
      unsigned int level = 0;
      const int result = DoMD(reader.get(), state, level);
      return MotionReport(result, state, level);
    }
    PassReport report{false, 0};
    ReadBufferRecord(buffer_, previous, [&](char* record, int length) {
      unsigned int level = 0;
      if (IsMotionDetected(record, length, level)) report = PassReport{true, static_cast<int>(level)};
    });
    return report;
  });
  return 0;
}

IPuxEID::IPuxEID(Camera* camera, CameraAPI* api, int stream, StreamBuffer* buffer)
    : camera_(camera), api_(api), stream_(stream), buffer_(buffer) {}

IPuxEID::~IPuxEID() { StopIfStarted(); }

void IPuxEID::QueryCamera(char* record, int length, bool& input) {
  input = record != nullptr && length >= kMinRecord && (record[kInputAt] & 0x01) != 0;
}

int IPuxEID::DoEID(MultipartFetch* reader, bool& input) {
  input = false;
  return ReadRecord(reader, [&](char* record, int length) { QueryCamera(record, length, input); });
}

int IPuxEID::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  std::unique_ptr<MultipartFetch> reader;
  if (!OpenRecords(camera_, api_, camera_->GetVideoType(), stream_, buffer_, &reader)) return 0;
  DataUnit* previous = nullptr;
  RunPolledLoop(*this, event_buffer_, kPeriod, [&]() -> PassReport {
    bool input = false;
    if (reader != nullptr) {
      const int result = DoEID(reader.get(), input);
      return InputReport(result, input);
    }
    // From the buffer a pass without a new record is a failed reading, like a failed read.
    int result = -1;
    ReadBufferRecord(buffer_, previous, [&](char* record, int length) {
      if (record == nullptr) return;
      QueryCamera(record, length, input);
      result = 0;
    });
    return InputReport(result, input);
  });
  return 0;
}
