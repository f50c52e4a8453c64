#include "detectors/vivotek.h"

#include <string>

#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/inputscan.h"
#include "framework/polledloop.h"

namespace {

// One firmware family's request form.
struct InputForm {
  int first;          // number of the first input
  const char* path;   // followed by the input number
  const char* key;    // followed by the input number
  const char* value;  // what an active input says
};

// Groups 0 and 1 (and 2 and 3) name firmware variants that ask alike.
const InputForm kNumberedFromOne = {1, "cgi-bin/getdi.cgi?di", "DI", "H"};
const InputForm kNumberedFromZero = {0, "cgi-bin/dido/getdi.cgi?di", "di", "1"};

const InputForm* FormOf(VIVO_FUNC_GR group) {
  switch (static_cast<int>(group)) {
    case 0:
    case 1:
      return &kNumberedFromOne;
    case 2:
    case 3:
      return &kNumberedFromZero;
    default:
      return nullptr;
  }
}

}  // namespace

VivotekEID::VivotekEID(Camera* camera, VIVO_FUNC_GR group, int inputs)
    : camera_(camera), group_(group), inputs_(inputs) {}

VivotekEID::~VivotekEID() { StopIfStarted(); }

int VivotekEID::DoEID(bool& active) {
  const InputForm* form = FormOf(group_);
  if (form == nullptr) {
    active = false;
    return -1;
  }
  AskUntilActive(form->first, inputs_, active, [this, form](int index) {
    const std::string number = itos(index);
    return SendHttpReqAndCheckResp(camera_, form->path + number, form->key + number,
                                   form->value) != 0;
  });
  return 0;
}

int VivotekEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, IntervalMicros(),
                     [this](bool& active) { return DoEID(active); });
  return 0;
}
