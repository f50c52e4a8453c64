// Axis network cameras. The digital inputs are asked one at a time at
// /axis-cgi/io/input.cgi?checkactive=N, answered with one line inputN=active or inputN=inactive.
// Motion data is pushed at /axis-cgi/motion/motiondata.cgi, the stream that the camera's API
// names: a part every 200 ms with a line "group=G;level=L;threshold=T;" per window.

#include "sim/emulation.h"
#include "sim/makers/inputquery.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kInputPath[] = "/axis-cgi/io/input.cgi";
constexpr char kMotionDataPath[] = "/axis-cgi/motion/motiondata.cgi";

void HandleAxis(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = GroupLine;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  if (AnswerInputQuery(connection, state, kInputPath, "text/plain")) return;
  connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
}

}  // namespace

Emulation AxisEmulation() {
  Emulation e;
  e.key = "axis";
  e.maker = "Axis";
  e.classes = {"AXISEID", "AxisMD"};
  e.handle = HandleAxis;
  e.detectors = {
      {"AXISEID", "inputs", {{"inputs", 2}}},
      {"AxisMD", "motion", nullptr},
  };
  e.api = [](int port) {
    return nlohmann::json{{"stream", {{"path", kMotionDataPath}, {"port", port}}}};
  };
  return e;
}

}  // namespace evsim
