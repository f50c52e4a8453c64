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
  const HttpRequest& request = connection.Request();
  if (request.method != "GET" || request.Path() != kStreamPath) {
    connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
    return;
  }
  ServeEventFrames(connection, state, FramePeriod(request, kFps), [](const CameraStatus& status) {
    return std::vector<JpegSegment>{{kJpegCom, ComSegment(status)}};
  });
}

}  // namespace

Emulation JvcEmulation() {
  Emulation e;
  e.key = "jvc";
  e.maker = "JVC";
  e.classes = {"JVCJpgMD"};
  e.handle = HandleJvc;
  e.detectors = {
      {"JVCJpgMD", "motion", {{"stream_buffer", true}}},
      {"JVCJpgMD", "motion-stream", nullptr},
  };
  e.api = [](int port) {
    return nlohmann::json{{"stream", {{"path", std::string(kStreamPath) + "?encode=jpeg"}, {"port", port}}}};
  };
  e.frames = [](int port) {
    return nlohmann::json{
        {"path", std::string(kStreamPath) + "?encode=jpeg&fps=" + std::to_string(kBufferFps)},
        {"port", port}};
  };
  return e;
}

}  // namespace evsim
