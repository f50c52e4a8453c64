#include "detectors/jvc.h"

#include <string>

#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/inputscan.h"
#include "framework/polledloop.h"

namespace {

const char kApiPrefix[] = "/api/param?";
const char kPinKey[] = "peripheral.input_pin.pin";
const char kActive[] = "make&200";

}  // namespace

JVCEID::JVCEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

JVCEID::~JVCEID() { StopIfStarted(); }

int JVCEID::DoEID(bool& active) {
  if (camera_ == nullptr) return -1;
  active = false;
  AskUntilActive(1, inputs_, active, [this](int pin) {
    // The key is the parameter asked for, as the answer names it.
    const std::string key = std::string(kPinKey) + "(" + itos(pin) + ").status";
    return SendHttpReqAndCheckResp(camera_, kApiPrefix + key, key, kActive) != 0;
  });
  return 0;
}

int JVCEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond,
                     [this](bool& active) { return DoEID(active); });
  return 0;
}
