// JVC network cameras: a motion-JPEG stream at /api/video whose frames carry a 256-byte COM
// segment of the camera's status, in which byte 233 is '1' while the camera sees motion and
// '0' otherwise. The alarm inputs answer at the parameter API:
// /api/param?peripheral.input_pin.pin(N).status gives the line
// "peripheral.input_pin.pin(N).status=make&200" while input N is active, "...=break&200"
// while it is not.

#include <algorithm>
#include <string>
#include <vector>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/api/video";
constexpr char kParamPath[] = "/api/param";
constexpr char kPinPrefix[] = "peripheral.input_pin.pin(";
constexpr char kPinSuffix[] = ").status";
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

// Answers a GET of an input pin's status; 400 for any other parameter.
void AnswerPin(HttpConnection& connection, const CameraState& state) {
  const HttpRequest& request = connection.Request();
  const std::string path = kParamPath;
  const std::string query = request.target.substr(std::min(request.target.size(), path.size() + 1));
  const std::string prefix = kPinPrefix, suffix = kPinSuffix;
  int pin = 0;
  if (query.size() > prefix.size() + suffix.size() && query.size() < prefix.size() + suffix.size() + 4 &&
      query.compare(0, prefix.size(), prefix) == 0 &&
      query.compare(query.size() - suffix.size(), suffix.size(), suffix) == 0) {
    const std::string digits = query.substr(prefix.size(), query.size() - prefix.size() - suffix.size());
    if (digits.find_first_not_of("0123456789") == std::string::npos) pin = std::stoi(digits);
  }
  if (pin < 1 || pin > kInputCount) {
    connection.Write(MakeResponse(400, "text/plain", "unknown parameter\r\n"));
    return;
  }
  const std::string value = state.Get().Input(pin) ? "make&200" : "break&200";
  connection.Write(MakeResponse(200, "text/plain", query + "=" + value + "\r\n"));
}

void HandleJvc(HttpConnection& connection, CameraState& state) {
  const HttpRequest& request = connection.Request();
  if (request.method == "GET" && request.Path() == kParamPath) {
    AnswerPin(connection, state);
    return;
  }
  if (!ServesGetOf(connection, kStreamPath)) return;
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
                                 {"JVCEID", "inputs", {{"inputs", 2}}},
                             });
  e.api = StreamApi(std::string(kStreamPath) + "?encode=jpeg");
  e.frames = FramesAt(std::string(kStreamPath) + "?encode=jpeg&fps=" + std::to_string(kBufferFps));
  return e;
}

}  // namespace evsim
