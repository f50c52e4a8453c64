#include "detectors/canon.h"

#include <strings.h>

#include <cstdio>
#include <cstring>

#include "framework/host/httpclient.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"
#include "framework/readline.h"

namespace {

const char kInfoPath[] = "/-wvhttp-01-/info.cgi";
const int kResponseSize = 4096;
const int kLineSize = 256;
const int kMaxLines = 100;
const int kTimeout = 30;

// GET path and read the camera's text/plain answer, up to 4096 bytes, into buffer.
// The buffer is cleared first so that bytes past the answer read as its end.
int GetHttpRespToBuf(Camera* camera, const std::string& path, char* buffer) {
  memset(buffer, 0, kResponseSize);
  CgiRequest request(camera, path, kTimeout, kResponseSize);
  if (!request.ContentTypeIs("text/plain")) return -1;
  return request.Client().ReadData(buffer, kResponseSize) < 0 ? -1 : 0;
}

bool ParseMotion(const char* buffer, int length) {
  char line[kLineSize];
  int position = -1;
  int motion = 0;
  for (int i = 0; i < kMaxLines; ++i) {
    ReadLineFromBuf(buffer, position, length, line, kLineSize);
    if (line[0] == '\0') break;
    if (strncasecmp(line, "m.1", 3) == 0) sscanf(line, "m.1:=%d", &motion);
  }
  return motion == 1;
}

bool ParseInputs(const char* buffer, int length, int input) {
  char line[kLineSize];
  int position = -1;
  int index = input;
  int value = 0;
  for (int i = 0; i < kMaxLines; ++i) {
    ReadLineFromBuf(buffer, position, length, line, kLineSize);
    if (line[0] == '\0') break;
    if (strncasecmp(line, "i.", 2) != 0) continue;
    sscanf(line, "i.%d:=%d", &index, &value);
    if (index >= 1 && value == 1) return true;
  }
  return false;
}

}  // namespace

CanonMD::CanonMD(Camera* camera) : camera_(camera) {}

CanonMD::~CanonMD() { StopIfStarted(); }

int CanonMD::DoMD(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  char response[kResponseSize];
  if (GetHttpRespToBuf(camera_, kInfoPath, response) != 0) return -1;
  if (ParseMotion(response, kResponseSize)) {
    state = true;
    level = 100;
  }
  return 0;
}

int CanonMD::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunMotionPolledLoop(*this, event_buffer_, kOneSecond,
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}

CanonEID::CanonEID(Camera* camera, int input) : camera_(camera), input_(input) {}

CanonEID::~CanonEID() { StopIfStarted(); }

int CanonEID::DoEID(bool& state) {
  state = false;
  char response[kResponseSize];
  if (GetHttpRespToBuf(camera_, kInfoPath, response) != 0) return -1;
  state = ParseInputs(response, kResponseSize, input_);
  return 0;
}

int CanonEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond,
                     [this](bool& state) { return DoEID(state); });
  return 0;
}
