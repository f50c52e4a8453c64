#include "detectors/etrovision.h"

#include <strings.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/motiondata.h"
#include "framework/readline.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

StreamPart::Shape EtrovisionShape() {
  StreamPart::Shape shape;
  shape.header_size = 256;
  return shape;
}

int FindMotionOn(const char* text, int length) {
  return ScanLines(text, length, [](const char* line) {
    return strncasecmp(line, "md1=on", 6) == 0 ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

// The value buffer lives across lines: a line that sets no value is judged with the last one.
int FindInputOn(const char* text, int length, int inputs) {
  char value[32];
  memset(value, 0, sizeof(value));
  int number = 0;
  return ScanLines(text, length, [&](const char* line) {
    if (strncasecmp(line, "input", 5) != 0) return LineVerdict::kNext;
    if (sscanf(line, "input%d=%31s", &number, value) == EOF) return LineVerdict::kEnd;
    return number <= inputs && strncasecmp(value, "on", 2) == 0 ? LineVerdict::kEvent
                                                                 : LineVerdict::kNext;
  });
}

}  // namespace

ETROVISIONMD::ETROVISIONMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

ETROVISIONMD::~ETROVISIONMD() { StopIfStarted(); }

int ETROVISIONMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, EtrovisionShape(), motion, level,
                        [](char* text, int length, unsigned int& found) {
                          if (FindMotionOn(text, length) == 0) return false;
                          found = 100;
                          return true;
                        });
}

int ETROVISIONMD::EventDetecor() {
  RunApiMotionDataLoop(*this, event_buffer_, camera_, api_,
                       [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                         return DoMD(fetch, motion, level);
                       });
  return 0;
}

ETROVISIONEID::ETROVISIONEID(Camera* camera, CameraAPI* api, int inputs)
    : camera_(camera), api_(api), inputs_(inputs) {}

ETROVISIONEID::~ETROVISIONEID() { StopIfStarted(); }

int ETROVISIONEID::DoEID(MultipartFetch* fetch, bool& active, unsigned int& level) {
  return ReadMotionPart(fetch, EtrovisionShape(), active, level,
                        [this](char* text, int length, unsigned int& found) {
                          if (FindInputOn(text, length, inputs_) == 0) return false;
                          found = 100;
                          return true;
                        });
}

int ETROVISIONEID::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  std::string path;
  int port = 80;
  if (!GetApiStream(*api_, path, port)) return 0;
  RunInputStreamLoop(*this, event_buffer_, *camera_, path, port, StreamLoopShape{},
                     [this](MultipartFetch* fetch, bool& active) {
                       unsigned int level = 0;
                       return DoEID(fetch, active, level);
                     });
  return 0;
}
