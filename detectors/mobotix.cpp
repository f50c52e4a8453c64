#include "detectors/mobotix.h"

#include <climits>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>

#include "framework/host/camera.h"
#include "framework/host/httpclient.h"
#include "framework/polledloop.h"

namespace {

const char kMotionPath[] = "/control/event.jpg?output=alarmupdate&filter=VM";
const char kInputPath[] = "/control/event.jpg?output=alarmupdate&filter=SI";
const char kCounterKey[] = "alarmcounter=";
const int kLineSize = 1024;
const int kTimeout = 10;
const unsigned int kMotionLevel = 100;
const unsigned int kInputLevel = 1;

// The counter as a 32-bit strtol reads it: out-of-range numbers saturate, they do not wrap.
int32_t ParseCounter(const char* text) {
  long number = strtol(text, nullptr, 10);
  if (number > INT32_MAX) return INT32_MAX;
  if (number < INT32_MIN) return INT32_MIN;
  return static_cast<int32_t>(number);
}

}  // namespace

MobotixMD::MobotixMD(Camera* camera, EVENT_DET_TYPE type)
    : camera_(camera), type_(type), last_alarm_counter_(0) {}

MobotixMD::~MobotixMD() { StopIfStarted(); }

int MobotixMD::DoMD(bool& detected, unsigned int& level) {
  detected = false;
  level = 0;
  std::string path;
  if (type_ == EVENT_DET_MOTION) {
    path = kMotionPath;
  } else if (type_ == EVENT_DET_INPUT) {
    path = kInputPath;
  }
  if (SendReqAndGetResp(camera_, path, detected) != 0) return -1;
  if (detected) level = type_ == EVENT_DET_MOTION ? kMotionLevel : kInputLevel;
  return 0;
}

int MobotixMD::SendReqAndGetResp(Camera* camera, std::string path, bool& changed) {
  if (camera == nullptr) return -1;
  auto client = std::make_unique<VoHttpClient>(camera->GetHost(), camera->GetPort(), path,
                                               camera->GetUsername(), camera->GetPassword(),
                                               kTimeout);
  int status = 0;
  if (client->SendRequest(VO_HTTP_GET) != 0) return -1;
  if (client->CheckResponse(status) != 0) return -1;
  char line[kLineSize];
  if (client->ReadToLineEnd(line, kLineSize) <= 0) return -1;
  char* counter = strstr(line, kCounterKey);
  if (counter == nullptr) {
    changed = false;
    return 0;
  }
  char* end = strchr(counter, ';');
  if (end != nullptr) *end = '\0';
  const int32_t number = ParseCounter(strchr(counter, '=') + 1);
  changed = number != last_alarm_counter_;
  last_alarm_counter_ = number;
  return 0;
}

int MobotixMD::EventDetecor() {
  bool first = true;
  RunPolledLoop(*this, event_buffer_, IntervalMicros(), [this, &first]() -> std::optional<PassReport> {
    bool detected = false;
    unsigned int level = 0;
    const int result = DoMD(detected, level);
    const bool quiet = first && result == 0;
    first = false;
    if (quiet) return std::nullopt;
    return MotionReport(result, detected, level);
  });
  return 0;
}
