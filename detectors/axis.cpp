#include "detectors/axis.h"

#include "framework/inputquery.h"
#include "framework/motiondata.h"

namespace {

const char kInputPath[] = "axis-cgi/io/input.cgi?checkactive=";

}  // namespace

AXISEID::AXISEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

AXISEID::~AXISEID() { StopIfStarted(); }

int AXISEID::DoEID(bool& active) {
  return ScanInputs(camera_, inputs_, active,
                    [this](int input, bool& on) { return QueryCamera(input, on); });
}

int AXISEID::QueryCamera(int input, bool& active) {
  return QueryInput(camera_, kInputPath, input, active, SendHttpReqAndCheckLine);
}

int AXISEID::EventDetecor() {
  return RunInputQueryLoop(*this, event_buffer_, camera_,
                           [this](bool& active) { return DoEID(active); });
}

AxisMD::AxisMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

AxisMD::~AxisMD() { StopIfStarted(); }

int AxisMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [this](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) == 1;
  });
}

int AxisMD::IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, MotionLineFormat::kGroupChar, IdleLevel::kLastLine);
}

int AxisMD::EventDetecor() {
  RunApiMotionDataLoop(*this, event_buffer_, camera_, api_,
                       [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                         return DoMD(fetch, motion, level);
                       });
  return 0;
}
