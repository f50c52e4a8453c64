#include "detectors/zavio.h"

#include <algorithm>

#include "framework/host/cameraapi.h"

namespace {

const char kInputPath[] = "cgi-bin/admin/input?checkactive=";
// The API of the models that count motion levels 0 to 1000 instead of 0 to 100.
const char kVgaApi[] = "zaviovga";
const unsigned int kVgaLevelCap = 1000;

}  // namespace

ZavioEID::ZavioEID(Camera* camera, int inputs)
    : InputQueryEID(camera, inputs, kInputPath, InputAnswerCheck::kLine) {}

ZavioEID::~ZavioEID() { StopIfStarted(); }

ZavioMD::ZavioMD(Camera* camera, CameraAPI* api) : MotionDataMD(camera, api, {MotionLineFormat::kGroupChar, IdleLevel::kLargest, nullptr}) {}

ZavioMD::~ZavioMD() { StopIfStarted(); }

int ZavioMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  const int result = MotionDataMD::DoMD(fetch, motion, level);
  if (result == 0 && api_ != nullptr && api_->GetCameraCap()->GetAPI() == kVgaApi) {
    level = std::min(level, kVgaLevelCap) / 10;
  }
  return result;
}
