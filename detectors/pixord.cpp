#include "detectors/pixord.h"

#include <cstdio>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/motiondata.h"
#include "framework/polledloop.h"
#include "framework/readline.h"

namespace {

const char kInputPath[] = "/cgi-bin/admin/sm.cgi?actions=listgroup&Input";

}  // namespace

PIXORDMD::PIXORDMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api), threshold_(0) {}

PIXORDMD::~PIXORDMD() { StopIfStarted(); }

int PIXORDMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [this](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) == 1;
  });
}

int PIXORDMD::IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanLines(body, length, [this, &level](const char* line) {
    char group = 0;
    int found = 0;
    int sensitivity = 0;
    const int fields =
        sscanf(line, "group=%c;level=%d;sensitivity=%d;", &group, &found, &sensitivity);
    level = static_cast<unsigned int>(found);
    if (fields == EOF) return LineVerdict::kEnd;
    return found > threshold_ ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

int PIXORDMD::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  int unused1 = 0, threshold = 0, unused3 = 0, unused4 = 0;
  api_->GetMDParams(unused1, threshold, unused3, unused4);
  threshold_ = threshold;
  RunApiMotionDataLoop(*this, event_buffer_, camera_, api_,
                       [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                         return DoMD(fetch, motion, level);
                       });
  return 0;
}

PIXORDEID::PIXORDEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

PIXORDEID::~PIXORDEID() { StopIfStarted(); }

int PIXORDEID::DoEID(bool& active) {
  if (camera_ == nullptr) return -1;
  active = false;
  for (int input = 0; input < inputs_ && !active; ++input) {
    const std::string key = "Input.I0" + itos(input) + ".Status";
    active = SendHttpReqAndCheckResp(camera_, kInputPath, key, "high") != 0;
  }
  return 0;
}

int PIXORDEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond, [this](bool& active) { return DoEID(active); });
  return 0;
}
