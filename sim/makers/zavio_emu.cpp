// Zavio network cameras. The digital inputs are asked one at a time at
// /cgi-bin/admin/input?checkactive=N, answered (as text/html) with one line inputN=active or
// inputN=inactive.
// Motion data is pushed at /cgi-bin/motion/motiondata.cgi, the stream that the camera's API
// names: a part every 200 ms with a line "group=G;level=L;threshold=T;" per window. The
// simulated model is a VGA one (API "zaviovga"), which counts levels from 0 to 1000.

#include "sim/emulation.h"
#include "sim/makers/inputquery.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kInputPath[] = "/cgi-bin/admin/input";
constexpr char kMotionDataPath[] = "/cgi-bin/motion/motiondata.cgi";

void HandleZavio(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = GroupLine;
  style.scale = 10;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  if (AnswerInputQuery(connection, state, kInputPath, "text/html")) return;
  connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
}

}  // namespace

Emulation ZavioEmulation() {
  Emulation e;
  e.key = "zavio";
  e.maker = "Zavio";
  e.classes = {"ZavioEID", "ZavioMD"};
  e.handle = HandleZavio;
  e.detectors = {
      {"ZavioEID", "inputs", {{"inputs", 2}}},
      {"ZavioMD", "motion", nullptr},
  };
  e.api = [](int port) {
    return nlohmann::json{{"name", "zaviovga"},
                          {"stream", {{"path", kMotionDataPath}, {"port", port}}}};
  };
  return e;
}

}  // namespace evsim
