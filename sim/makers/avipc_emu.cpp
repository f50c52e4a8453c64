// AVIPC network cameras. The digital inputs are asked one at a time at
// /cgi-bin/io/input.cgi?checkactive=N, answered with one line inputN=active or inputN=inactive.
// Motion data is pushed at /cgi-bin/motion/motiondata.cgi, the stream that the camera's API
// names: a part every 200 ms with a line "group=G;level=L;threshold=T;" per window.

#include "sim/emulation.h"
#include "sim/makers/inputquery.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kInputPath[] = "/cgi-bin/io/input.cgi";
constexpr char kMotionDataPath[] = "/cgi-bin/motion/motiondata.cgi";

void HandleAVIPC(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = GroupLine;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  if (AnswerInputQuery(connection, state, kInputPath, "text/plain")) return;
  connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
}

}  // namespace

Emulation AVIPCEmulation() {
  Emulation e;
  e.key = "avipc";
  e.maker = "AVIPC";
  e.classes = {"AVIPCEID", "AvipcMD"};
  e.handle = HandleAVIPC;
  e.detectors = {
      {"AVIPCEID", "inputs", {{"inputs", 2}}},
      {"AvipcMD", "motion", nullptr},
  };
  e.api = [](int port) {
    return nlohmann::json{{"stream", {{"path", kMotionDataPath}, {"port", port}}}};
  };
  return e;
}

}  // namespace evsim
