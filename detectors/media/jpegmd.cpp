#include "detectors/media/jpegmd.h"

#include <syslog.h>

#include <algorithm>
#include <climits>

#include "framework/host/camera.h"
#include "framework/host/streambuffer.h"
#include "framework/mediaframe.h"
#include "framework/polledloop.h"

namespace {

const char kSourceName[] = "jpegmd";
const char kLoopName[] = "EventDetecor";
const int kDefaultSensitivity = 90;
const int kDefaultThreshold = 10;
const int kFullFrame = 10000;
// The host keeps a camera's frame buffer in shared memory under its id plus this.
const int kBufferIdBase = 0x80000;

const int kMotion = 3;
const int kNoMotion = 4;
const int kReference = 8;

}  // namespace

const MDEngineCalls& HostMDEngine() {
  static const MDEngineCalls calls = {
      MD_CreateDetection, MD_FinishDetection,  MD_SetMDSensitivity,
      MD_SetMDThreshold,  MD_EnableFastMD,     MD_SetDetectRange,
      MD_DetectMotionSeq, MD_GetMDSensitivity, MD_GetMDThreshold,
  };
  return calls;
}

MD::MD() : MD(&HostMDEngine()) {}

MD::MD(const MDEngineCalls* calls) : calls_(calls), state_{nullptr} {
  calls_->create(&state_);
  calls_->set_sensitivity(&state_, kDefaultSensitivity);
  calls_->set_threshold(&state_, kDefaultThreshold);
  calls_->enable_fast(&state_, 1);
}

MD::~MD() { calls_->finish(&state_); }

int MD::AddRect(_tag_MD_RECT& rect) { return calls_->set_range(&state_, &rect) > 0 ? -1 : 0; }

int MD::AddRect(int left, int top, int right, int bottom) {
  _tag_MD_RECT rect = {top, left, right, bottom, 0};
  return AddRect(rect);
}

int MD::SetSensitivity(int sensitivity) {
  return calls_->set_sensitivity(&state_, sensitivity & 255) > 0 ? -1 : 0;
}

int MD::SetThreshold(int threshold) {
  return calls_->set_threshold(&state_, threshold & 255) > 0 ? -1 : 0;
}

int MD::GetSensitivity(int& sensitivity) {
  return calls_->get_sensitivity(&state_, &sensitivity) > 0 ? -1 : 0;
}

int MD::GetThreshold(int& threshold) {
  return calls_->get_threshold(&state_, &threshold) > 0 ? -1 : 0;
}

void MD::ResetSequence() { calls_->detect(&state_, nullptr, 0, nullptr); }

int MD::Detect(char* data, int length, int& level) {
  level = 0;
  if (data == nullptr) {
    ResetSequence();
    return kNoMotion;
  }
  const int result = calls_->detect(&state_, data, length, &level);
  if (result == kMotion || result == kNoMotion) return result;
  if (result == kReference) return kNoMotion;
  ResetSequence();
  return result;
}

int ApplyMotionConfig(Camera* camera, MD* engine) {
  if (camera == nullptr || engine == nullptr) return -1;
  const MotionDetection& motion = camera->GetMotionDet();
  engine->SetSensitivity(camera->GetSensitivity());
  engine->SetThreshold(camera->GetThreshold());
  const int count = motion.RegionCount();
  if (count == 0) {
    engine->AddRect(0, 0, kFullFrame, kFullFrame);
    return 0;
  }
  for (int i = 0; i < count; ++i) {
    const MotionRegion region = motion.GetRegion(i);
    engine->AddRect(region.Left(), region.Top(), region.Right(), region.Bottom());
  }
  return 0;
}

JpegDiffMD::JpegDiffMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api)
    : JpegDiffMD(camera, buffer, api, &HostMDEngine()) {}

JpegDiffMD::JpegDiffMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api,
                       const MDEngineCalls* engine)
    : engine_(std::make_unique<MD>(engine)), camera_(camera), buffer_(buffer), api_(api) {}

JpegDiffMD::~JpegDiffMD() { StopIfStarted(); }

int JpegDiffMD::GetSensitivity() {
  int value = 0;
  return engine_->GetSensitivity(value) == 0 ? value : -1;
}

int JpegDiffMD::GetThreshold() {
  int value = 0;
  return engine_->GetThreshold(value) == 0 ? value : -1;
}

int JpegDiffMD::SetSensitivity(int sensitivity) { return engine_->SetSensitivity(sensitivity); }

int JpegDiffMD::SetThreshold(int threshold) { return engine_->SetThreshold(threshold); }

int JpegDiffMD::GetImageLen(FetcherBase* fetcher, int* length) {
  return ReadFrameLength(fetcher, length);
}

int JpegDiffMD::FetchImage(FetcherBase* fetcher, char* buffer, int length) {
  return ReadFrameBody(fetcher, buffer, length);
}

int JpegDiffMD::EventDetecor() {
  if (camera_ == nullptr) {
    syslog(LOG_ERR, "%s:%d:%s(): Null camera object", kSourceName, __LINE__, kLoopName);
    return 0;
  }
  // A buffer attached here is this run's own and is detached when the run ends.
  StreamBuffer* buffer = buffer_;
  const bool attached = buffer == nullptr;
  if (attached) buffer = StreamBuffer::AttachShared(camera_->GetId() + kBufferIdBase);
  if (ApplyMotionConfig(camera_, engine_.get()) != 0) {
    if (attached) StreamBuffer::DetachShared(buffer);
    return 0;
  }

  DataUnit* previous = nullptr;
  RunPolledLoop(*this, event_buffer_, IntervalMicros(), [&]() -> PassReport {
    int level = 0;
    bool state = false;
    DataUnit* unit = buffer != nullptr ? buffer->ReadLatest(previous) : nullptr;
    if (unit != nullptr) {
      int length = 0;
      char* frame = UnitFrame(*buffer, *unit, &length);
      if (frame != nullptr && length > 0) state = engine_->Detect(frame, length, level) == kMotion;
      buffer->ReadFinish(unit, false);
      previous = unit;
    }
    return PassReport{state, level};
  });
  if (attached) StreamBuffer::DetachShared(buffer);
  return 0;
}
