// Arecont network cameras. The motion CGI, whose path the camera's API block names, answers
// text entries "key=value" ending with an empty line; "mdresult" is "no" while the camera sees
// no motion, else the number of the first zone that saw it.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kMotionPath[] = "/motion";
constexpr char kMotionTarget[] = "/motion?mdresult";

void HandleArecont(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kMotionPath)) return;
  if (connection.Request().target != kMotionTarget) {
    AnswerNotFound(connection);
    return;
  }
  const bool motion = state.Get().motion > 0;
  connection.Write(MakeResponse(200, "text/plain", std::string("mdresult=") + (motion ? "1" : "no") + "\r\n\r\n"));
}

}  // namespace

Emulation ArecontEmulation() {
  Emulation e = MakeEmulation("arecont", "Arecont", HandleArecont,
                              {
                                  {"ARECONTMD", "motion", nullptr},
                              });
  e.api = StreamApi(std::string(kMotionTarget + 1), "arecont");  // the model's path is relative
  return e;
}

}  // namespace evsim
