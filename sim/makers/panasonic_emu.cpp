// Panasonic network cameras: a motion-JPEG stream at /nphMotionJpeg whose frames carry the
// camera's state in a 32-byte COM segment. Byte 13 is the motion level in steps of 5 %
// (0..20), byte 12 the level it must exceed; byte 0 holds the alarm inputs in the layout of
// the camera's function group: group 0 sets bit 7 while input 1 is active, group 1 (asked
// with "group=1" in the query) keeps bits 7 and 6 set while it is idle and clears bit 6
// while it is active.
//
// The same cameras push their state as text lines at /nphStatusStream (the API's default
// stream; the motion-JPEG stream is its stream (1, 2)), a part every 200 ms: "motiondetect
// T|F" (T while the motion level is above 20 %) and "terminalN I L|H" for inputs 1 and 2
// (L, low, while active).

#include <chrono>
#include <string>
#include <vector>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/nphMotionJpeg";
constexpr char kStreamQuery[] = "?Resolution=160x120&Quality=Standard";
constexpr int kComSize = 32;
constexpr int kMotionStep = 5;        // percent per unit of byte 13
constexpr unsigned char kMotionFloor = 2;  // byte 12: byte 13 above it means motion
constexpr int kFps = 10;
constexpr char kStatusPath[] = "/nphStatusStream";
constexpr int kStatusInputs = 2;
constexpr int kMotionThreshold = 20;

std::string StatusLines(const CameraStatus& status) {
  std::string text = std::string("motiondetect ") + (status.motion > kMotionThreshold ? "T" : "F") + "\r\n";
  for (int n = 1; n <= kStatusInputs; ++n) {
    text += "terminal" + std::to_string(n) + " I " + (status.Input(n) ? "L" : "H") + "\r\n";
  }
  return text;
}

std::string ComSegment(const CameraStatus& status, bool group1) {
  std::string com(kComSize, '\0');
  if (group1) {
    com[0] = static_cast<char>(status.Input(1) ? 0x80 : 0xC0);
  } else {
    com[0] = static_cast<char>(status.Input(1) ? 0x80 : 0x00);
  }
  com[12] = static_cast<char>(kMotionFloor);
  com[13] = static_cast<char>((status.motion + kMotionStep - 1) / kMotionStep);
  return com;
}

void HandlePanasonic(HttpConnection& connection, CameraState& state) {
  if (connection.Request().method == "GET" && connection.Request().Path() == kStatusPath) {
    ServeMultipart(connection, "text/plain", std::chrono::milliseconds(200), [&]() -> std::string {
      const CameraStatus status = state.Get();
      return status.silent ? std::string() : StatusLines(status);
    });
    return;
  }
  if (!ServesGetOf(connection, kStreamPath)) return;
  const HttpRequest& request = connection.Request();
  const bool group1 = request.target.find("group=1") != std::string::npos;
  ServeEventFrames(connection, state, FramePeriod(request, kFps),
                   [group1](const CameraStatus& status) {
                     return std::vector<JpegSegment>{{kJpegCom, ComSegment(status, group1)}};
                   });
}

}  // namespace

Emulation PanasonicEmulation() {
  Emulation e = MakeEmulation("panasonic", "Panasonic", HandlePanasonic,
                             {
                                 {"PanaJpgED", "motion", {{"type", 0}}},
                                 {"PanaJpgED", "input", {{"type", 1}, {"function_group", 0}}},
                                 {"PanaMD", "status-motion", nullptr},
                                 {"PanaEID", "status-inputs", {{"inputs", 2}}},
                             });
  e.api = [](int port) {
    return nlohmann::json{
        {"stream", {{"path", kStatusPath}, {"port", port}}},
        {"streams", {{"1,2", {{"path", std::string(kStreamPath) + kStreamQuery}, {"port", port}}}}}};
  };
  return e;
}

}  // namespace evsim
