#include "detectors/media/rtphdrdetector.h"

#include <chrono>
#include <memory>
#include <new>
#include <optional>
#include <thread>
#include <utility>

#include "detectors/media/vivotekrecord.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/host/rtpfetch.h"
#include "framework/mediaframe.h"
#include "framework/polledloop.h"

namespace {

// The camera's stream type whose packets carry the extension data.
const int kExtensionStreamType = 1;
const char kVivotekClient[] = "RTPExPlayer";

// What the loop keeps between passes.
struct RtpState {
  std::unique_ptr<RtpFetch> reader;  // null until needed and after a failed read
  std::unique_ptr<char[]> buffer;    // extension data; only grows
  unsigned int capacity = 0;         // bytes of buffer
  // The last extension length read. Kept when a later read fails, so that such a pass
  // judges the last data again rather than reporting a gap.
  unsigned int length = 0;
  std::string path;
  int port = 80;                     // the camera API may change it
};

}  // namespace

RtpHdrDetector::RtpHdrDetector(Camera* camera, CameraAPI* api, std::string clientName)
    : camera_(camera), api_(api), client_name_(std::move(clientName)) {}

int RtpHdrDetector::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) {
    event_buffer_->SetStatus(false, 0);
    return 0;
  }
  RtpState rtp;
  RunPolledLoop(*this, event_buffer_, kMediaPeriod, [&]() -> std::optional<PassReport> {
    bool state = false;
    unsigned int level = 0;
    if (rtp.reader == nullptr && camera_->GetStmType() == kExtensionStreamType) {
      api_->PrepareStream(camera_->GetVideoType(), 1);
      if (api_->GetStreamPath(rtp.path, rtp.port) == 0) {
        rtp.reader.reset(new (std::nothrow) RtpFetch(camera_->GetHost(), rtp.port, rtp.path,
                                                     camera_->GetUsername(),
                                                     camera_->GetPassword(), client_name_));
      }
    }
    if (rtp.reader != nullptr) {
      if (GetExtDataLen(rtp.reader.get(), rtp.length) != 0) {
        rtp.reader.reset();
      } else if (rtp.length == 0) {
        // A packet without extension says nothing: no report for it.
        std::this_thread::sleep_for(std::chrono::seconds(1));
        return std::nullopt;
      } else {
        if (rtp.length > rtp.capacity) {
          rtp.buffer.reset();
          rtp.buffer.reset(new (std::nothrow) char[rtp.length]);
          rtp.capacity = rtp.buffer != nullptr ? rtp.length : 0;
        }
        if (FetchExtData(rtp.reader.get(), rtp.buffer.get(), rtp.length) != 0) {
          rtp.reader.reset();
        }
      }
    }
    if (rtp.buffer != nullptr && rtp.length != 0) {
      state = DoED(rtp.buffer.get(), rtp.length, level);
    } else {
      BackOffMediaStream(*this);
    }
    return PassReport{state, static_cast<int>(level)};
  });
  return 0;
}

int RtpHdrDetector::GetExtDataLen(RtpFetch* fetch, unsigned int& length) {
  if (fetch == nullptr) return -1;
  return fetch->NextHdrInfo(length) == 0 ? 0 : -1;
}

int RtpHdrDetector::FetchExtData(RtpFetch* fetch, char* buffer, unsigned int length) {
  if (fetch == nullptr) return -1;
  if (buffer == nullptr || length == 0) {
    fetch->SkipContent(buffer, static_cast<int>(length));
    return -1;
  }
  return fetch->FetchExtData(reinterpret_cast<unsigned char*>(buffer), length) == 0 ? 0 : -1;
}

bool RtpHdrDetector::DoED(char* data, unsigned int length, unsigned int& level) {
  return IsEventDetected(data, length, level);
}

VivotekMp4MD::VivotekMp4MD(Camera* camera, CameraAPI* api, VIVO_FUNC_GR group)
    : RtpHdrDetector(camera, api, kVivotekClient), group_(group) {}

VivotekMp4MD::~VivotekMp4MD() { StopIfStarted(); }

bool VivotekMp4MD::IsEventDetected(char* data, unsigned int length, unsigned int& level) {
  level = 0;
  if (data == nullptr || length == 0) return false;
  return ReadVivotekRecord(reinterpret_cast<const unsigned char*>(data), length, "mp4v", true,
                           level);
}
