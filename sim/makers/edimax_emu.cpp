// Edimax network cameras: an event stream of small JPEG frames at the path that the camera
// API names, a part every 200 ms, whose part headers carry "motion-event: 1" while the
// motion level is above 20 %, else "motion-event: 0".

#include <chrono>
#include <optional>
#include <string>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kEdimaxPath[] = "/mjpg/event.cgi";
constexpr int kMotionThreshold = 20;
constexpr std::chrono::milliseconds kPeriod{200};

void HandleEdimax(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kEdimaxPath)) return;
  const std::string frame = EncodeGreyJpeg(64, 48, 90, {});
  ServeMultipartParts(connection, "image/jpeg", kPeriod, [&]() -> std::optional<PushPart> {
    const CameraStatus status = state.Get();
    if (status.silent) return std::nullopt;
    const bool moving = status.motion > kMotionThreshold;
    return PushPart{frame, std::string("motion-event: ") + (moving ? "1" : "0") + "\r\n", ""};
  });
}

}  // namespace

Emulation EdimaxEmulation() {
  Emulation e = MakeEmulation("edimax", "Edimax", HandleEdimax,
                              {
                                  {"EDIMAXMD", "motion", nullptr},
                              });
  e.api = StreamApi(kEdimaxPath);
  return e;
}

}  // namespace evsim
