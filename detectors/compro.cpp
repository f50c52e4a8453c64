#include "detectors/compro.h"

#include <strings.h>

#include "framework/host/httpclient.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kMotionListPath[] = "cgi-bin/view/list_param.cgi?Action=List&Group=MotionDetect";
const int kLineSize = 1024;
const int kTimeout = 10;

// Reads the answer's first line; `motion` says whether it begins with "Region:0".
// 0 on success, -1 on failure.
int GetHttpRespToBuf(Camera* camera, const std::string& path, bool& motion) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.Ok()) return -1;  // any Content-Type will do, as long as there is one
  char line[kLineSize];
  if (request.Client().ReadToLineEnd(line, kLineSize) < 0) return -1;
  motion = strncasecmp(line, "Region:0", 8) == 0;
  return 0;
}

}  // namespace

COMPROMD::COMPROMD(Camera* camera) : camera_(camera) {}

COMPROMD::~COMPROMD() { StopIfStarted(); }

int COMPROMD::DoMD(bool& state, unsigned int& level) {
  if (camera_ == nullptr) return -1;
  state = false;
  level = 0;
  if (GetHttpRespToBuf(camera_, kMotionListPath, state) != 0) return -1;
  if (state) level = 100;
  return 0;
}

int COMPROMD::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunMotionPolledLoop(*this, event_buffer_, kOneSecond,
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}
