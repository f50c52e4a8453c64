#include "detectors/brickcom.h"

#include <string>

#include "framework/host/camera.h"
#include "framework/host/textutil.h"
#include "framework/keyvalueanswer.h"
#include "framework/polledloop.h"

namespace {

const char kGpioPath[] = "cgi-bin/gpio.cgi?action=get";
const char kActiveStatus[] = "0";

}  // namespace

BrickcomEID::BrickcomEID(Camera* camera, CameraAPI* api, int inputs)
    : camera_(camera), api_(api), inputs_(inputs) {}

BrickcomEID::~BrickcomEID() { StopIfStarted(); }

int BrickcomEID::DoEID(bool& active) {
  active = false;
  if (inputs_ < 1) return 0;
  if (camera_ == nullptr) return -1;
  for (int input = 1; input <= inputs_; ++input) {
    const std::string key = "di" + itos(input) + ".status";
    std::string value;
    if (GetKeyValueAnswer(camera_, kGpioPath, camera_->GetPort(), key, value, ValueForm::kAsFound) != 0) {
      return -1;
    }
    if (value == kActiveStatus) {
      active = true;
      return 0;
    }
  }
  return 0;
}

int BrickcomEID::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  RunPassLoop(
      *this, event_buffer_,
      [this] {
        bool active = false;
        const int result = DoEID(active);
        return InputReport(result, active);
      },
      [] {});
  return 0;
}
