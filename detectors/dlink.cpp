#include "detectors/dlink.h"

#include <strings.h>

#include <cstdio>
#include <string>

#include "framework/host/httpclient.h"
#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kNotifyPath[] = "config/notify.cgi";
const int kLineSize = 1024;
const int kMaxInputLines = 10;
const int kTimeout = 10;

// What one notify.cgi request found.
struct NotifyReading {
  int level = 0;
  bool on = false;
};

// input 0 reads the motion lines (md1, then mdv1); input N >= 1 looks for "inputN=on" among
// the first 10 lines. The camera lists more than 10 lines, so a body that ends before the
// tenth is taken as a broken answer even without a match. 0 on success, -1 on failure.
int GetHttpRespToBuf(Camera* camera, const std::string& path, int input, NotifyReading& reading) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.Ok()) return -1;  // any Content-Type will do, as long as there is one
  VoHttpClient& client = request.Client();
  char line[kLineSize];
  if (input == 0) {
    if (client.ReadToLineEnd(line, kLineSize) < 0) return -1;
    if (strncasecmp(line, "md1=on", 6) != 0) {
      reading.level = 0;
      reading.on = false;
      return 0;
    }
    reading.on = true;
    if (client.ReadToLineEnd(line, kLineSize) < 0) return -1;
    sscanf(line, "mdv1=%d", &reading.level);
    return 0;
  }
  const std::string text = "input" + itos(input) + "=on";
  reading.on = false;
  for (int i = 0; i < kMaxInputLines; ++i) {
    if (client.ReadToLineEnd(line, kLineSize) < 0) return -1;
    if (strncasecmp(line, text.c_str(), text.size()) == 0) {
      reading.on = true;
      break;
    }
  }
  return 0;
}

}  // namespace

DLinkMD::DLinkMD(Camera* camera) : camera_(camera) {}

DLinkMD::~DLinkMD() { StopIfStarted(); }

int DLinkMD::DoMD(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  NotifyReading reading;
  if (GetHttpRespToBuf(camera_, kNotifyPath, 0, reading) != 0) return -1;
  level = static_cast<unsigned int>(reading.level);
  state = reading.on;
  return 0;
}

int DLinkMD::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, IntervalMicros(),
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}

DLINKEID::DLINKEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

DLINKEID::~DLINKEID() { StopIfStarted(); }

int DLINKEID::DoEID(bool& state) {
  if (camera_ == nullptr) return -1;
  state = false;
  for (int input = 1; input <= inputs_; ++input) {
    NotifyReading reading;
    if (GetHttpRespToBuf(camera_, kNotifyPath, input, reading) != 0) return -1;
    if (reading.on) {
      state = true;
      break;
    }
  }
  return 0;
}

int DLINKEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond,
                     [this](bool& state) { return DoEID(state); });
  return 0;
}
