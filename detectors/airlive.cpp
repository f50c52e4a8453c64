#include "detectors/airlive.h"

#include "framework/httpreq.h"
#include "framework/inputquery.h"
#include "framework/motiondata.h"

namespace {

const char kInputPath[] = "io/input.cgi?checkactive=";
const char kMotionDataPath[] = "motion/motiondata.cgi";

// 1 when a group of the part is above its threshold, with its level; else 0 with the last
// line's level.
int IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, MotionLineFormat::kGroupNumber,
                         IdleLevel::kLastLine);
}

}  // namespace

AIRLIVEV1EID::AIRLIVEV1EID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

AIRLIVEV1EID::~AIRLIVEV1EID() { StopIfStarted(); }

int AIRLIVEV1EID::DoEID(bool& active) {
  return ScanInputs(camera_, inputs_, active,
                    [this](int input, bool& on) { return QueryCamera(input, on); });
}

int AIRLIVEV1EID::QueryCamera(int input, bool& active) {
  return QueryInput(camera_, kInputPath, input, active, SendHttpReqAndCheckResp);
}

int AIRLIVEV1EID::EventDetecor() {
  return RunInputQueryLoop(*this, event_buffer_, camera_,
                           [this](bool& active) { return DoEID(active); });
}

AirliveV1MD::AirliveV1MD(Camera* camera) : camera_(camera) {}

AirliveV1MD::~AirliveV1MD() { StopIfStarted(); }

int AirliveV1MD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) != 0;
  });
}

int AirliveV1MD::EventDetecor() {
  RunFixedMotionDataLoop(*this, event_buffer_, camera_, kMotionDataPath,
                         [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                           return DoMD(fetch, motion, level);
                         });
  return 0;
}
