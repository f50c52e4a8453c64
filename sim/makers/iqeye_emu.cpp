// IQeye network cameras: motion data pushed at /now.motiondata on the camera's own port, one
// part every 200 ms with a line "window=N;level=L;threshold=T" per window, windows counted
// from 1 (see sim/motionpush.h).

#include <string>

#include "sim/emulation.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

constexpr char kMotionDataPath[] = "/now.motiondata";

std::string WindowLine(int window, int level, int threshold) {
  return "window=" + std::to_string(window + 1) + ";level=" + std::to_string(level) +
         ";threshold=" + std::to_string(threshold);
}

void HandleIqeye(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = WindowLine;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  AnswerNotFound(connection);
}

}  // namespace

Emulation IqeyeEmulation() {
  return MakeEmulation("iqeye", "IQeye", HandleIqeye,
                       {
                           {"IQeyeV2MD", "motion", nullptr},
                       });
}

}  // namespace evsim
