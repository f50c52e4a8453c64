// IPux network cameras: a multipart stream of 32-byte status records at
// /cgi-bin/status.cgi, one part per period. Byte 24 is the motion reading as a raw byte
// (0..255, which the detector scales to 0..99 %), byte 27 the alarm inputs, bit 0 for input
// 1 and bit 1 for input 2. The camera's motion threshold, in percent, comes with its API
// data.

#include <algorithm>
#include <string>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/cgi-bin/status.cgi";
constexpr int kRecordSize = 32;
constexpr int kThreshold = 50;
constexpr int kFps = 10;
constexpr int kBufferFps = 100;  // the receiver of the frame buffer reads at full speed

std::string StatusRecord(const CameraStatus& status) {
  std::string record(kRecordSize, '\0');
  record.replace(0, 4, "IPUX");
  // The inverse of the detector's scale: raw (x + 1) * 99 / 256 + 0.5 is the percent.
  const int raw = status.motion == 0 ? 0 : std::clamp(status.motion * 256 / 99 - 1, 0, 255);
  record[24] = static_cast<char>(raw);
  record[27] = static_cast<char>((status.Input(1) ? 0x01 : 0) | (status.Input(2) ? 0x02 : 0));
  return record;
}

void HandleIpux(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kStreamPath)) return;
  const HttpRequest& request = connection.Request();
  ServeMultipart(connection, "application/octet-stream", FramePeriod(request, kFps),
                 [&state]() -> std::string {
                   const CameraStatus status = state.Get();
                   return status.silent ? std::string() : StatusRecord(status);
                 });
}

}  // namespace

Emulation IpuxEmulation() {
  Emulation e = MakeEmulation("ipux", "IPux", HandleIpux,
                             {
                                 {"IPuxMD", "motion", nullptr},
                                 {"IPuxEID", "input", {{"inputs", 1}}},
                                 {"IPuxMD", "motion-buffered", {{"stream_buffer", true}}},
                             });
  e.api = [](int port) {
    return nlohmann::json{{"stream", {{"path", kStreamPath}, {"port", port}}},
                          {"md_params", {0, kThreshold, 0, 0}}};
  };
  e.frames = FramesAt(std::string(kStreamPath) + "?fps=" + std::to_string(kBufferFps));
  return e;
}

}  // namespace evsim
