#include "detectors/messoa.h"

#include <strings.h>

#include <cstring>
#include <string>

#include "framework/host/httpclient.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kStatusPath[] = "cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus";
const char kModeKey[] = "Mode";
const int kLineSize = 1024;
const int kMaxLines = 10;
const int kTimeout = 10;

// GET path and look in the camera's text answer for `key` among the lines after the section
// header (the first line that begins with "["). At most 10 lines are read, the ones before
// the header included. 0 with the first matching key's value (its first word, blanks and
// apostrophes around it dropped), or with `value` untouched when no line matched within the
// 10; -1 when the request fails, the body ends first, or a line after the header has no
// token or a matching key no value.
int GetHttpRespToBuf(Camera* camera, const std::string& path, const std::string& key,
                     std::string& value) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.ContentTypeIs("text")) return -1;
  char line[kLineSize];
  bool inSection = false;
  for (int i = 0; i < kMaxLines; ++i) {
    if (request.Client().ReadToLineEnd(line, kLineSize) < 0) return -1;
    if (!inSection) {
      inSection = line[0] == '[';
      continue;
    }
    char* save = nullptr;
    const char* name = strtok_r(line, " :=", &save);
    if (name == nullptr) return -1;
    if (strncasecmp(name, key.c_str(), key.size()) != 0) continue;
    const char* found = strtok_r(nullptr, " '", &save);
    if (found == nullptr) return -1;
    value = found;
    return 0;
  }
  return 0;
}

// The camera's Mode value: 0 and `mode` filled in (empty when the camera gave none), or -1.
int ReadMode(Camera* camera, std::string& mode) {
  return GetHttpRespToBuf(camera, kStatusPath, kModeKey, mode);
}

}  // namespace

MessoaMD::MessoaMD(Camera* camera) : camera_(camera) {}

MessoaMD::~MessoaMD() { StopIfStarted(); }

int MessoaMD::DoMD(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  std::string mode;
  if (ReadMode(camera_, mode) != 0) return -1;
  if (mode == "2" || mode == "3") {
    state = true;
    level = 100;
  }
  return 0;
}

int MessoaMD::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, IntervalMicros(),
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}

MessoaEID::MessoaEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

MessoaEID::~MessoaEID() { StopIfStarted(); }

int MessoaEID::DoEID(bool& active) {
  active = false;
  std::string mode;
  if (ReadMode(camera_, mode) != 0) return -1;
  active = mode == "1" || mode == "3";
  return 0;
}

int MessoaEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, IntervalMicros(),
                     [this](bool& active) { return DoEID(active); });
  return 0;
}
