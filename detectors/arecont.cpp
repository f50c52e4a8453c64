#include "detectors/arecont.h"

#include "framework/host/cameraapi.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kResultKey[] = "mdresult";
const char kNoMotion[] = "no";
const int kDefaultPort = 80;

}  // namespace

ARECONTMD::ARECONTMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

ARECONTMD::~ARECONTMD() { StopIfStarted(); }

int ARECONTMD::DoMD(bool& detected, unsigned int& level) {
  if (camera_ == nullptr || api_ == nullptr) return -1;
  std::string path;
  int port = kDefaultPort;
  api_->GetStreamPath(path, port);
  std::string value;
  if (SendHttpReqAndGetResp(camera_, path, kResultKey, value) != 0) return -1;
  level = 0;
  detected = IsMotionDetected(value, level) == 1;
  return 0;
}

int ARECONTMD::IsMotionDetected(std::string value, unsigned int& level) {
  if (value.find(kNoMotion) == std::string::npos) {
    level = 100;
    return 1;
  }
  level = 0;
  return 0;
}

int ARECONTMD::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunMotionPolledLoop(*this, event_buffer_, kOneSecond,
                      [this](bool& detected, unsigned int& level) { return DoMD(detected, level); });
  return 0;
}
