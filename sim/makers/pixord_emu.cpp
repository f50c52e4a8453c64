// Pixord network cameras, on the camera's own port:
// - motion data pushed at the stream the camera API names, a part every 200 ms with the
//   lines "group=G;level=L;sensitivity=S;" for two groups (group 0 follows the motion level,
//   group 1 stays at 0); the threshold is not in the lines but in the API's motion
//   parameters (the second, 20);
// - GET /cgi-bin/admin/sm.cgi?actions=listgroup&Input answers the input group, one line
//   "Input.I0N.Status=high|low" per input, inputs 1..8 of the simulator being I00..I07.

#include <chrono>
#include <string>

#include "sim/emulation.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kMotionPath[] = "/cgi-bin/motion.cgi";
constexpr char kParamPath[] = "/cgi-bin/admin/sm.cgi";
constexpr int kThreshold = 20;

std::string SensitivityLine(int window, int level, int /*threshold*/) {
  return "group=" + std::to_string(window) + ";level=" + std::to_string(level) +
         ";sensitivity=80;";
}

void AnswerInputGroup(HttpConnection& connection, const CameraState& state) {
  const CameraStatus status = state.Get();
  std::string text;
  for (int n = 1; n <= kInputCount; ++n) {
    text += "Input.I0" + std::to_string(n - 1) + ".Status=" + (status.Input(n) ? "high" : "low") +
            "\r\n";
  }
  connection.Write(MakeResponse(200, "text/plain", text));
}

void HandlePixord(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = SensitivityLine;
  style.threshold = kThreshold;
  if (ServeMotionDataAt(connection, state, kMotionPath, style)) return;
  if (!ServesGetOf(connection, kParamPath)) return;
  AnswerInputGroup(connection, state);
}

}  // namespace

Emulation PixordEmulation() {
  Emulation e = MakeEmulation("pixord", "Pixord", HandlePixord,
                              {
                                  {"PIXORDMD", "motion", nullptr},
                                  {"PIXORDEID", "inputs", {{"inputs", 2}}},
                              });
  const auto stream = StreamApi(kMotionPath);
  e.api = [stream](int port) {
    nlohmann::json api = stream(port);
    api["md_params"] = {0, kThreshold, 0, 0};
    return api;
  };
  return e;
}

}  // namespace evsim
