#include "framework/keyvalueanswer.h"

#include <cstdlib>
#include <memory>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/httpclient.h"
#include "framework/host/textutil.h"
#include "framework/polledloop.h"

namespace {

const int kAnswerSize = 8192;
const int kTimeout = 10;
const int kDefaultPort = 80;
const long kBoth = 3;

}  // namespace

int GetKeyValueAnswer(Camera* camera, const std::string& path, int port, const std::string& key,
                      std::string& value, ValueForm form) {
  if (camera == nullptr) return -1;
  auto client = std::make_unique<VoHttpClient>(camera->GetHost(), port, path, camera->GetUsername(),
                                               camera->GetPassword(), kTimeout);
  int status = 0;
  if (client->SendRequest(VO_HTTP_GET) != 0) return -1;
  if (client->CheckResponse(status) != 0) return -1;
  // One read: what it gives is the whole answer, however long the camera's really is.
  auto answer = std::make_unique<char[]>(kAnswerSize);
  const int length = client->ReadData(answer.get(), kAnswerSize);
  if (length <= 0) return -1;
  if (FindKeyVal(std::string(answer.get(), static_cast<size_t>(length)), key, value, "=", "\n") != 0) {
    value.clear();
    return -1;
  }
  if (form == ValueForm::kFirstSemicolonDropped) {
    const size_t semicolon = value.find(';');
    if (semicolon != std::string::npos) value.erase(semicolon, 1);
  }
  return 0;
}

int GetAlarmStatus(Camera* camera, CameraAPI* api, const AlarmStatusForm& form, long& number) {
  if (camera == nullptr || api == nullptr) return -1;
  std::string path;
  int port = kDefaultPort;
  api->GetStreamPath(path, port);  // without a configured stream: "" on port 80
  std::string value;
  if (GetKeyValueAnswer(camera, path, port, form.key, value, form.value_form) != 0) return -1;
  number = strtol(value.c_str(), nullptr, 10);
  return 0;
}

AlarmStatusMD::AlarmStatusMD(Camera* camera, CameraAPI* api, const AlarmStatusForm& form)
    : camera_(camera), api_(api), form_(form) {}

int AlarmStatusMD::DoMD(bool& detected, unsigned int& level) {
  detected = false;
  level = 0;
  long number = 0;
  if (GetAlarmStatus(camera_, api_, form_, number) != 0) return -1;
  if (number == form_.motion || number == kBoth) {
    detected = true;
    level = 100;
  }
  return 0;
}

int AlarmStatusMD::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, IntervalMicros(),
                      [this](bool& detected, unsigned int& level) { return DoMD(detected, level); });
  return 0;
}

AlarmStatusEID::AlarmStatusEID(Camera* camera, CameraAPI* api, int unused, const AlarmStatusForm& form)
    : camera_(camera), api_(api), unused_(unused), form_(form) {}

int AlarmStatusEID::DoEID(bool& active) {
  active = false;
  long number = 0;
  if (GetAlarmStatus(camera_, api_, form_, number) != 0) return -1;
  active = number == form_.input || number == kBoth;
  return 0;
}

int AlarmStatusEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, IntervalMicros(), [this](bool& active) { return DoEID(active); });
  return 0;
}
