#include "detectors/zavio.h"

#include <algorithm>
#include <string>

#include "framework/host/cameraapi.h"
#include "framework/inputquery.h"
#include "framework/motiondata.h"

namespace {

const char kInputPath[] = "cgi-bin/admin/input?checkactive=";
// The API of the models that count motion levels 0 to 1000 instead of 0 to 100.
const char kVgaApi[] = "zaviovga";
const unsigned int kVgaLevelCap = 1000;

}  // namespace

ZavioEID::ZavioEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

ZavioEID::~ZavioEID() { StopIfStarted(); }

int ZavioEID::DoEID(bool& active) {
  return ScanInputs(camera_, inputs_, active,
                    [this](int input, bool& on) { return QueryCamera(input, on); });
}

int ZavioEID::QueryCamera(int input, bool& active) {
  return QueryInput(camera_, kInputPath, input, active, SendHttpReqAndCheckLine);
}

int ZavioEID::EventDetecor() {
  return RunInputQueryLoop(*this, event_buffer_, camera_,
                           [this](bool& active) { return DoEID(active); });
}

ZavioMD::ZavioMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

ZavioMD::~ZavioMD() { StopIfStarted(); }

int ZavioMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  const int result =
      ReadMotionPart(fetch, motion, level, [this](char* body, int length, unsigned int& found) {
        return IsMotionDetected(body, length, found) == 1;
      });
  if (result == 0 && api_ != nullptr && api_->GetCameraCap()->GetAPI() == kVgaApi) {
    level = std::min(level, kVgaLevelCap) / 10;
  }
  return result;
}

int ZavioMD::IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, MotionLineFormat::kGroupChar, IdleLevel::kLargest);
}

int ZavioMD::EventDetecor() {
  RunApiMotionDataLoop(*this, event_buffer_, camera_, api_,
                       [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                         return DoMD(fetch, motion, level);
                       });
  return 0;
}
