#include "sim/makers/motionpush.h"

#include "sim/scene/mjpeg.h"

namespace evsim {

void ServeMotionData(HttpConnection& connection, const CameraState& state,
                     const MotionDataStyle& style) {
  ServeMultipart(connection, "text/plain", style.period, [&]() -> std::string {
    const CameraStatus status = state.Get();
    if (status.silent) return "";
    const int threshold = style.threshold * style.scale;
    return style.line(0, status.motion * style.scale, threshold) + "\r\n" +
           style.line(1, 0, threshold) + "\r\n";
  });
}

bool ServeMotionDataAt(HttpConnection& connection, const CameraState& state, std::string_view path,
                       const MotionDataStyle& style) {
  const HttpRequest& request = connection.Request();
  if (request.method != "GET" || request.Path() != path) return false;
  ServeMotionData(connection, state, style);
  return true;
}

std::string GroupLine(int window, int level, int threshold) {
  return "group=" + std::to_string(window) + ";level=" + std::to_string(level) +
         ";threshold=" + std::to_string(threshold) + ";";
}

}  // namespace evsim
