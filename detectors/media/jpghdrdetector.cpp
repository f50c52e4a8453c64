#include "detectors/media/jpghdrdetector.h"

#include <syslog.h>

#include <csetjmp>
#include <cstring>
#include <memory>
#include <new>
#include <string>

#include "detectors/media/vivotekrecord.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/fetcher.h"
#include "framework/host/jpegsrc.h"
#include "framework/host/streambuffer.h"
#include "framework/mediaframe.h"
#include "framework/polledloop.h"
#include "framework/streamloop.h"

// The detectors are built against the IJG 62 interface: its structure sizes are what
// jpeg_CreateDecompress is told.
static_assert(JPEG_LIB_VERSION == 62, "the JPEG header detectors need libjpeg's IJG 62 API");

namespace {

const char kSourceName[] = "jpghdrdetector";
const char kLoopName[] = "EventDetecor";
const unsigned int kMaxSavedSegment = 65535;
const int kMarkerCom = 0xFE;
const int kMarkerApp0 = 0xE0;
const int kMarkerApp2 = 0xE2;

// What the loop of a stream-mode detector keeps between passes.
struct StreamState {
  std::unique_ptr<FetcherBase> reader;  // null until needed and after a failed read
  std::unique_ptr<char[]> frame;        // the frame buffer; only grows
  int capacity = 0;                     // bytes of frame
  std::string path;
  int port = 80;                        // the camera API may change it
};

// The next frame of the camera's stream in the growing frame buffer, or null when there is
// none: no stream path, or a failed read, after which the reader is dropped.
char* NextStreamFrame(JpgHdrDetector& detector, const Camera& camera, CameraAPI* api,
                      StreamState* stream, int* length) {
  if (stream->reader == nullptr) {
    api->PrepareStream(1, 2);
    if (api->GetStreamPath(stream->path, stream->port) != 0) return nullptr;
    stream->reader = OpenPartStream(camera, stream->path, stream->port);
    if (stream->reader == nullptr) return nullptr;
  }
  if (detector.GetImageLen(stream->reader.get(), length) == 0) {
    if (*length > stream->capacity) {
      stream->frame.reset();
      stream->frame.reset(new (std::nothrow) char[*length]);
      stream->capacity = stream->frame != nullptr ? *length : 0;
    }
    if (detector.FetchImage(stream->reader.get(), stream->frame.get(), *length) == 0) {
      return stream->frame.get();
    }
  }
  stream->reader.reset();
  return nullptr;
}

}  // namespace

JpgHdrDetector::JpgHdrDetector(Camera* camera, StreamBuffer* buffer, CameraAPI* api,
                               int markerCode)
    : camera_(camera), buffer_(buffer), api_(api), marker_code_(markerCode) {}

int JpgHdrDetector::EventDetecor() {
  if (camera_ == nullptr) {
    syslog(LOG_ERR, "%s:%d:%s(): Null camera object", kSourceName, __LINE__, kLoopName);
    event_buffer_->SetStatus(false, 0);
    return 0;
  }
  if (buffer_ == nullptr && api_ == nullptr) {
    syslog(LOG_ERR, "%s:%d:%s(): Null camera api", kSourceName, __LINE__, kLoopName);
    event_buffer_->SetStatus(false, 0);
    return 0;
  }

  DataUnit* previous = nullptr;
  StreamState stream;
  RunPolledLoop(*this, event_buffer_, kMediaPeriod, [&]() -> PassReport {
    unsigned int level = 0;
    bool state = false;
    int length = 0;
    if (buffer_ != nullptr) {
      DataUnit* unit = buffer_->ReadLatest(previous);
      if (unit != nullptr) {
        char* frame = UnitFrame(*buffer_, *unit, &length);
        if (frame != nullptr && length > 0) state = DoED(frame, length, level);
        buffer_->ReadFinish(unit, false);
        previous = unit;
      }
    } else {
      char* frame = NextStreamFrame(*this, *camera_, api_, &stream, &length);
      if (frame != nullptr && length > 0) {
        state = DoED(frame, length, level);
      } else {
        BackOffMediaStream(*this);
      }
    }
    return PassReport{state, static_cast<int>(level)};
  });
  return 0;
}

bool JpgHdrDetector::DoED(char* data, int length, unsigned int& level) {
  if (data == nullptr || length <= 0) return false;
  // Nothing with a destructor lives in this frame: the error exit long-jumps back here.
  JpegErrorJump error;
  jpeg_decompress_struct cinfo;
  SetJpegExit(&cinfo, &error);
  if (setjmp(error.jump) != 0) {
    jpeg_abort_decompress(&cinfo);
    jpeg_destroy_decompress(&cinfo);
    return false;
  }
  jpeg_CreateDecompress(&cinfo, 62, sizeof(cinfo));
  JpegMemSrc(&cinfo, reinterpret_cast<const unsigned char*>(data),
             static_cast<unsigned long>(length));
  jpeg_save_markers(&cinfo, marker_code_, kMaxSavedSegment);
  jpeg_read_header(&cinfo, TRUE);

  bool detected = false;
  const jpeg_saved_marker_ptr first = cinfo.marker_list;
  if (first != nullptr) {
    if (first->marker == marker_code_) {
      detected = IsEventDetected(reinterpret_cast<char*>(first->data), first->data_length, level);
    } else {
      jpeg_abort_decompress(&cinfo);
    }
  }
  jpeg_destroy_decompress(&cinfo);
  return detected;
}

int JpgHdrDetector::GetImageLen(FetcherBase* fetcher, int* length) {
  return ReadFrameLength(fetcher, length);
}

int JpgHdrDetector::FetchImage(FetcherBase* fetcher, char* buffer, int length) {
  return ReadFrameBody(fetcher, buffer, length);
}

PanaJpgED::PanaJpgED(Camera* camera, CameraAPI* api, EVENT_DET_TYPE type, PANA_FUNC_GR group)
    : JpgHdrDetector(camera, nullptr, api, kMarkerCom), type_(type), group_(group) {}

PanaJpgED::~PanaJpgED() { StopIfStarted(); }

bool PanaJpgED::IsEventDetected(char* data, unsigned int length, unsigned int& level) {
  level = 0;
  if (data == nullptr || length == 0) return false;
  const unsigned char* bytes = reinterpret_cast<const unsigned char*>(data);
  switch (type_) {
    case EVENT_DET_MOTION: {
      // Bytes 12 and 13 must be in the saved segment.
      if (length < 14) return false;
      const unsigned int scaled = bytes[13] * 5u;
      level = scaled > 100 ? 100 : scaled;
      return bytes[12] < bytes[13];
    }
    case EVENT_DET_INPUT:
      level = 1;
      if (group_ == PANA_FUNC_GR_0) return (bytes[0] & 0x80) != 0;
      // Group 1 reads inverted: only both bits set means idle.
      if (group_ == PANA_FUNC_GR_1) return (bytes[0] & 0xC0) != 0xC0;
      return false;
  }
  return false;
}

VivotekJpgMD::VivotekJpgMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api,
                           VIVO_FUNC_GR group)
    : JpgHdrDetector(camera, buffer, api, group == VIVO_FUNC_GR_APP0 ? kMarkerApp0 : kMarkerApp2),
      group_(group) {}

VivotekJpgMD::~VivotekJpgMD() { StopIfStarted(); }

bool VivotekJpgMD::IsEventDetected(char* data, unsigned int length, unsigned int& level) {
  if (data == nullptr || length == 0) return false;
  const unsigned char* bytes = reinterpret_cast<const unsigned char*>(data);
  level = 0;
  if (group_ == VIVO_FUNC_GR_APP0) {
    if (length < 7 || (bytes[6] & 0x01) == 0) return false;
    // A record that ends with byte 6 has no level nibble: it reads as 0.
    const unsigned int nibble = length > 7 ? (bytes[7] & 0x0F) : 0;
    level = nibble * 6 + 6;
    return true;
  }
  return ReadVivotekRecord(bytes, length, "jpeg", false, level);
}

JVCJpgMD::JVCJpgMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api)
    : JpgHdrDetector(camera, buffer, api, kMarkerCom) {}

JVCJpgMD::~JVCJpgMD() { StopIfStarted(); }

bool JVCJpgMD::IsEventDetected(char* data, unsigned int length, unsigned int& level) {
  const unsigned int kFlagAt = 233;
  if (data == nullptr || length == 0) return false;
  // The library saves only what the segment holds: a shorter one has no flag to read.
  const bool motion = length > kFlagAt && data[kFlagAt] == '1';
  level = motion ? 100 : 0;
  return motion;
}
