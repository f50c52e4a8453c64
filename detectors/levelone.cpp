#include "detectors/levelone.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/httpclient.h"
#include "framework/host/textutil.h"
#include "framework/host/vosocket.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kMotionPath[] = "cgi-bin/admin/param?action=list&group=Motion";
const char kInputPath[] = "io/query_io.cgi";
const int kTimeout = 5;
const int kWindows = 3;
const unsigned int kLevelCap = 1000;

// The window a settings line names: M0 (as a prefix), M1 or M2 (exactly); -1 for none.
int WindowOf(const char* token) {
  if (strncmp(token, "M0", 2) == 0) return 0;
  if (strcmp(token, "M1") == 0) return 1;
  if (strcmp(token, "M2") == 0) return 2;
  return -1;
}

// Applies one settings line, "Mn.Field=value", to the windows.
void ApplySetting(char* line, LevelOneGr2MD::MotionWindow* windows) {
  char* save = nullptr;
  const char* name = strtok_r(line, " .=", &save);
  if (name == nullptr) return;
  const int w = WindowOf(name);
  if (w < 0) return;
  const char* field = strtok_r(nullptr, ".=", &save);
  if (field == nullptr) return;
  const char* value = strtok_r(nullptr, ".=", &save);
  LevelOneGr2MD::MotionWindow& window = windows[w];
  if (strcmp(field, "Enabled") == 0) {
    // Only the exact "no" disables: "No", "off" or a missing value leave the window on.
    window.enabled = value == nullptr || strcmp(value, "no") != 0;
    return;
  }
  if (value == nullptr) return;
  const long number = strtol(value, nullptr, 10);
  if (strcmp(field, "Sensitivity") == 0) {
    window.sensitivity = static_cast<int>(number);
  } else if (strcmp(field, "Threshold") == 0) {
    window.threshold = static_cast<unsigned int>(number);
  } else if (strcmp(field, "Left") == 0) {
    window.left = static_cast<int>(number);
  } else if (strcmp(field, "Top") == 0) {
    window.top = static_cast<int>(number);
  } else if (strcmp(field, "Right") == 0) {
    window.right = static_cast<int>(number);
  } else if (strcmp(field, "Bottom") == 0) {
    window.bottom = static_cast<int>(number);
  }
}

// Reads "R1=a,R2=b,R3=c" into readings[0..2]. A name is looked for after each value with
// "." and "=" only as delimiters, so a name must follow its comma directly.
void ParseReadings(char* line, unsigned int* readings) {
  char* save = nullptr;
  const char* name = strtok_r(line, " ,.=", &save);
  while (name != nullptr) {
    if (name[0] == 'R' && name[1] >= '1' && name[1] <= '3') {
      const char* value = strtok_r(nullptr, " ,.=", &save);
      if (value == nullptr) return;
      readings[name[1] - '1'] = static_cast<unsigned int>(strtol(value, nullptr, 10));
    }
    name = strtok_r(nullptr, ".=", &save);
  }
}

}  // namespace

LevelOneGr2MD::LevelOneGr2MD(Camera* camera) : camera_(camera), line_(), windows_() {}

LevelOneGr2MD::~LevelOneGr2MD() { StopIfStarted(); }

int LevelOneGr2MD::GetMotionWin() {
  // The settings come whatever the answer's type says.
  CgiRequest request(camera_, kMotionPath, kTimeout, kLineSize, ContentTypeRule::kIgnored);
  if (!request.Ok()) return -1;
  memset(windows_, 0, sizeof(windows_));
  while (request.Client().ReadToLineEnd(line_, kLineSize) > 0) ApplySetting(line_, windows_);
  return 0;
}

int LevelOneGr2MD::DoMD(bool& state, unsigned int& level) {
  unsigned int readings[kWindows] = {0, 0, 0};
  state = false;
  level = 0;
  if (GetMotionWin() < 0) return -1;
  std::unique_ptr<VoSocket> socket(new VoSocket(camera_->GetHost(), kReadingPort, kTimeout, true));
  if (socket->BuildConnect() != 0) return -1;
  if (socket->ReadToLineEnd(line_, kLineSize) < 0) return -1;
  ParseReadings(line_, readings);
  socket->DisConnect();
  // The level is divided after each window and the next raw reading is compared with the
  // divided value: the level is that of the last enabled window whose reading exceeded the
  // running level. Recorders rely on these levels as they are.
  for (int w = 0; w < kWindows; ++w) {
    if (!windows_[w].enabled) continue;
    if (readings[w] > level) level = readings[w];
    level = (level > kLevelCap ? kLevelCap : level) / 10;
    if (readings[w] > windows_[w].threshold) state = true;
  }
  return 0;
}

int LevelOneGr2MD::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, IntervalMicros(),
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}

LevelOneGr1EID::LevelOneGr1EID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

LevelOneGr1EID::~LevelOneGr1EID() { StopIfStarted(); }

int LevelOneGr1EID::DoEID(bool& state) {
  for (int input = 1; input <= inputs_; ++input) {
    state = SendHttpReqAndCheckResp(camera_, kInputPath, "input_" + itos(input), "1") != 0;
  }
  return 0;
}

int LevelOneGr1EID::EventDetecor() {
  RunInputPolledLoop(*this, event_buffer_, IntervalMicros(),
                     [this](bool& state) { return DoEID(state); });
  return 0;
}
