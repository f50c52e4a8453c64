// AirLive network cameras (first generation). The digital inputs are asked one at a time at
// /io/input.cgi?checkactive=N, answered (as text/html) with one line inputN=active or
// inputN=inactive.
// Motion data is pushed at /motion/motiondata.cgi on the camera's own port: a part every
// 200 ms with a line "group=N;level=L;threshold=T;" per window.

#include "sim/emulation.h"
#include "sim/makers/inputquery.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kInputPath[] = "/io/input.cgi";
constexpr char kMotionDataPath[] = "/motion/motiondata.cgi";

void HandleAirLive(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = GroupLine;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  if (AnswerInputQuery(connection, state, kInputPath, "text/html")) return;
  connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
}

}  // namespace

Emulation AirLiveEmulation() {
  Emulation e;
  e.key = "airlive";
  e.maker = "AirLive";
  e.classes = {"AIRLIVEV1EID", "AirliveV1MD"};
  e.handle = HandleAirLive;
  e.detectors = {
      {"AIRLIVEV1EID", "inputs", {{"inputs", 2}}},
      {"AirliveV1MD", "motion", nullptr},
  };
  return e;
}

}  // namespace evsim
