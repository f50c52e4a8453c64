// Etrovision network cameras: an event stream at the path that the camera API names, a part
// every 200 ms: text parts with lines "md1=on|off" (on while the motion level is above
// 20 %) and "inputN=on|off" for inputs 1 and 2, each part with a long header line of camera
// status as these cameras send.

#include <chrono>
#include <optional>
#include <string>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kEtrovisionPath[] = "/cgi-bin/eventstream.cgi";
constexpr int kMotionThreshold = 20;
constexpr int kInputs = 2;
constexpr std::chrono::milliseconds kPeriod{200};

bool Moving(const CameraStatus& status) { return status.motion > kMotionThreshold; }

void HandleEtrovision(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kEtrovisionPath)) return;
  const std::string status_line = "X-Status: " + std::string(160, '0') + "\r\n";
  ServeMultipartParts(connection, "text/plain", kPeriod, [&]() -> std::optional<PushPart> {
    const CameraStatus status = state.Get();
    if (status.silent) return std::nullopt;
    std::string body = std::string("md1=") + (Moving(status) ? "on" : "off") + "\r\n";
    for (int n = 1; n <= kInputs; ++n) {
      body += "input" + std::to_string(n) + "=" + (status.Input(n) ? "on" : "off") + "\r\n";
    }
    return PushPart{body, status_line, ""};
  });
}

}  // namespace

Emulation EtrovisionEmulation() {
  Emulation e = MakeEmulation("etrovision", "Etrovision", HandleEtrovision,
                              {
                                  {"ETROVISIONMD", "motion", nullptr},
                                  {"ETROVISIONEID", "inputs", {{"inputs", 2}}},
                              });
  e.api = StreamApi(std::string(kEtrovisionPath) + "?type=all");
  return e;
}

}  // namespace evsim
