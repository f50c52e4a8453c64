// JVC network cameras: a motion-JPEG stream at /api/video whose frames carry a 256-byte COM
// segment of the camera's status, in which byte 233 is '1' while the camera sees motion and
// '0' otherwise.

#include <string>
#include <vector>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/api/video";
constexpr int kComSize = 256;
constexpr int kMotionAt = 233;
constexpr int kFps = 10;
constexpr int kBufferFps = 100;  // the receiver of the frame buffer reads at full speed

std::string ComSegment(const CameraStatus& status) {
  std::string com(kComSize, '0');
  com.replace(0, 8, "JVC-VN\r\n");
  com[kMotionAt] = status.motion > 0 ? '1' : '0';
  return com;
}

void HandleJvc(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kStreamPath)) return;
  const HttpRequest& request = connection.Request();
  ServeEventFrames(connection, state, FramePeriod(request, kFps), [](const CameraStatus& status) {
    return std::vector<JpegSegment>{{kJpegCom, ComSegment(status)}};
  });
}

}  // namespace

Emulation JvcEmulation() {
  Emulation e = MakeEmulation("jvc", "JVC", HandleJvc,
                             {
                                 {"JVCJpgMD", "motion", {{"stream_buffer", true}}},
                                 {"JVCJpgMD", "motion-stream", nullptr},
                             });
  e.api = StreamApi(std::string(kStreamPath) + "?encode=jpeg");
  e.frames = FramesAt(std::string(kStreamPath) + "?encode=jpeg&fps=" + std::to_string(kBufferFps));
  return e;
}

}  // namespace evsim
