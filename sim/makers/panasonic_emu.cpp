// Panasonic network cameras: a motion-JPEG stream at /nphMotionJpeg whose frames carry the
// camera's state in a 32-byte COM segment. Byte 13 is the motion level in steps of 5 %
// (0..20), byte 12 the level it must exceed; byte 0 holds the alarm inputs in the layout of
// the camera's function group: group 0 sets bit 7 while input 1 is active, group 1 (asked
// with "group=1" in the query) keeps bits 7 and 6 set while it is idle and clears bit 6
// while it is active.

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
                             });
  e.api = StreamApi(std::string(kStreamPath) + kStreamQuery);
  return e;
}

}  // namespace evsim
