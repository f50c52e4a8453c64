#include "detectors/avipc.h"

#include "framework/httpreq.h"
#include "framework/inputquery.h"
#include "framework/motiondata.h"

namespace {

const char kInputPath[] = "cgi-bin/io/input.cgi?checkactive=";

}  // namespace

AVIPCEID::AVIPCEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

AVIPCEID::~AVIPCEID() { StopIfStarted(); }

int AVIPCEID::DoEID(bool& active) {
  return ScanInputs(camera_, inputs_, active,
                    [this](int input, bool& on) { return QueryCamera(input, on); });
}

int AVIPCEID::QueryCamera(int input, bool& active) {
  return QueryInput(camera_, kInputPath, input, active, SendHttpReqAndCheckResp);
}

int AVIPCEID::EventDetecor() {
  return RunInputQueryLoop(*this, event_buffer_, camera_,
                           [this](bool& active) { return DoEID(active); });
}

AvipcMD::AvipcMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

AvipcMD::~AvipcMD() { StopIfStarted(); }

int AvipcMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [this](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) == 1;
  });
}

int AvipcMD::IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, MotionLineFormat::kGroupChar, IdleLevel::kLastLine);
}

int AvipcMD::EventDetecor() {
  RunApiMotionDataLoop(*this, event_buffer_, camera_, api_,
                       [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                         return DoMD(fetch, motion, level);
                       });
  return 0;
}
