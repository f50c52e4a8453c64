#include "detectors/edimax.h"

#include <cstdio>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/motiondata.h"
#include "framework/readline.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

int FindMotionEvent(const char* text, int length) {
  return ScanLines(text, length, [](const char* line) {
    int event = 0;
    if (sscanf(line, "motion-event: %d", &event) == EOF) return LineVerdict::kEnd;
    return event == 1 ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

}  // namespace

EDIMAXMD::EDIMAXMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

EDIMAXMD::~EDIMAXMD() { StopIfStarted(); }

int EDIMAXMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  StreamPart::Shape shape;
  shape.extra = StreamPart::Extra::kBefore;
  return ReadMotionPart(fetch, shape, motion, level,
                        [](char* text, int length, unsigned int& found) {
                          if (FindMotionEvent(text, length) == 0) return false;
                          found = 100;
                          return true;
                        });
}

int EDIMAXMD::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  std::string path;
  int port = 80;
  if (!GetApiStream(*api_, path, port)) return 0;
  RunMotionStreamLoop(*this, event_buffer_, *camera_, path, camera_->GetPort(),
                      [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                        return DoMD(fetch, motion, level);
                      });
  return 0;
}
