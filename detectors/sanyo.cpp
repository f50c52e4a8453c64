#include "detectors/sanyo.h"

#include <string>

#include "framework/binaryrecord.h"
#include "framework/host/cameraapi.h"
#include "framework/polledloop.h"

namespace {

const int kRecordSize = 48;
const int kEventLevel = 100;

// Which byte of the status record a request gives.
enum StatusByte { kMotionSelector = 0, kInputSelector = 1 };

// The byte of the 48-byte status record that `selector` names: 34 for motion, 33 for the
// inputs. 0 on success, -1 on failure.
int GetHttpRespToBuf(Camera* camera, const std::string& path, StatusByte selector, char& value) {
  unsigned char record[kRecordSize];
  if (GetBinaryRecord(camera, path, record, kRecordSize) != 0) return -1;
  value = static_cast<char>(record[selector == kMotionSelector ? 34 : 33]);
  return 0;
}

// The byte `selector` names, read from the status CGI that the camera's API gives.
int GetStatusByte(Camera* camera, CameraAPI* api, StatusByte selector, char& value) {
  if (camera == nullptr || api == nullptr) return -1;
  std::string path;
  int port = 80;
  if (api->GetStreamPath(path, port) != 0) return -1;
  return GetHttpRespToBuf(camera, path, selector, value);
}

}  // namespace

SanyoMD::SanyoMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

SanyoMD::~SanyoMD() { StopIfStarted(); }

bool SanyoMD::IsMotionDetected(char status, unsigned int& level) {
  const bool motion = (status & 0x02) != 0;
  level = motion ? kEventLevel : 0;
  return motion;
}

int SanyoMD::DoMD(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  char status = 0;
  if (GetStatusByte(camera_, api_, kMotionSelector, status) != 0) return -1;
  state = IsMotionDetected(status, level);
  return 0;
}

int SanyoMD::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunMotionPolledLoop(*this, event_buffer_, kOneSecond,
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}

SanyoEID::SanyoEID(Camera* camera, CameraAPI* api, int inputs)
    : camera_(camera), api_(api), inputs_(inputs) {}

SanyoEID::~SanyoEID() { StopIfStarted(); }

bool SanyoEID::IsEventDetected(char status, unsigned int& level) {
  const unsigned char bits = static_cast<unsigned char>(status);
  level = 0;
  for (int input = 0; input < inputs_ && input < 8; ++input) {
    if ((bits >> input) & 1) {
      level = kEventLevel;
      return true;
    }
  }
  return false;
}

int SanyoEID::DoEID(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  char status = 0;
  if (GetStatusByte(camera_, api_, kInputSelector, status) != 0) return -1;
  state = IsEventDetected(status, level);
  return 0;
}

int SanyoEID::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, kOneSecond,
                      [this](bool& state, unsigned int& level) { return DoEID(state, level); });
  return 0;
}
