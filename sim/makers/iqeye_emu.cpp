// IQeye network cameras, on the camera's own port:
// - motion data pushed at /now.motiondata, one part every 200 ms with a line
//   "window=N;level=L;threshold=T" per window, windows counted from 1 (see motionpush.h);
// - the server push of pictures at /now.jpg?snap=spush: every 200 ms a picture followed by a
//   line "Pragma: trigger=T" before the next boundary. With "pragma=motion" T names "motion"
//   while the motion level is above 20 %; with "pragma=trigger" it lists the active inputs
//   ("input1,input3"); otherwise it is "none". With "noimage" the picture is a 256-byte
//   placeholder instead of a JPEG frame.

#include <chrono>
#include <optional>
#include <string>

#include "sim/emulation.h"
#include "sim/makers/motionpush.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kMotionDataPath[] = "/now.motiondata";
constexpr char kPushPath[] = "/now.jpg";
constexpr int kMotionThreshold = 20;
constexpr std::chrono::milliseconds kPushPeriod{200};

std::string WindowLine(int window, int level, int threshold) {
  return "window=" + std::to_string(window + 1) + ";level=" + std::to_string(level) +
         ";threshold=" + std::to_string(threshold);
}

std::string Trigger(const CameraStatus& status, bool motion, bool inputs) {
  std::string trigger;
  if (motion && status.motion > kMotionThreshold) trigger = "motion";
  for (int n = 1; inputs && n <= kInputCount; ++n) {
    if (status.Input(n)) trigger += (trigger.empty() ? "input" : ",input") + std::to_string(n);
  }
  return trigger.empty() ? "none" : trigger;
}

void ServePush(HttpConnection& connection, CameraState& state) {
  const std::string& target = connection.Request().target;
  const bool motion = target.find("pragma=motion") != std::string::npos;
  const bool inputs = target.find("pragma=trigger") != std::string::npos;
  const bool noimage = target.find("noimage") != std::string::npos;
  const std::string picture = noimage ? std::string(256, ' ') : EncodeGreyJpeg(64, 48, 90, {});
  ServeMultipartParts(connection, "image/jpeg", kPushPeriod, [&]() -> std::optional<PushPart> {
    const CameraStatus status = state.Get();
    if (status.silent) return std::nullopt;
    return PushPart{picture, "", "Pragma: trigger=" + Trigger(status, motion, inputs) + "\r\n"};
  });
}

void HandleIqeye(HttpConnection& connection, CameraState& state) {
  MotionDataStyle style;
  style.line = WindowLine;
  if (ServeMotionDataAt(connection, state, kMotionDataPath, style)) return;
  if (!ServesGetOf(connection, kPushPath)) return;
  ServePush(connection, state);
}

}  // namespace

Emulation IqeyeEmulation() {
  return MakeEmulation("iqeye", "IQeye", HandleIqeye,
                       {
                           {"IQeyeV2MD", "motion", nullptr},
                           {"IQeyeV1MD", "trigger-motion", nullptr},
                           {"IQeyeV2EID", "inputs", {{"inputs", 1}}},
                       });
}

}  // namespace evsim
