// A camera that announces no events: a motion-JPEG stream at /scene.mjpg of a room in which
// an object moves while the camera's motion is on, with sensor noise and, every few
// seconds, a change of the light. Software motion detection (JpegDiffMD) watches it through
// the frame buffer that evwatch fills from the stream: handed the buffer, and attached by
// the camera's id from shared memory.

#include <chrono>
#include <string>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"
#include "sim/scene/scene.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/scene.mjpg";
constexpr int kFps = 10;
constexpr int kWidth = 320;
constexpr int kHeight = 240;
constexpr uint32_t kSeed = 11;  // every stream shows the same room
// The object covers 16% of the frame, above the default threshold of 10%.
constexpr double kObjectSize = 0.4;
constexpr double kObjectSpeed = 0.03;   // frame fractions per frame
constexpr int kLightPeriod = 5 * kFps;  // frames between changes of the light
constexpr double kLightGain = 1.3;

void HandleScene(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kStreamPath)) return;
  const HttpRequest& request = connection.Request();
  SceneOptions options;
  options.width = kWidth;
  options.height = kHeight;
  options.seed = kSeed;
  Scene scene(options);
  SceneObject object;
  object.x = 0.1;
  object.y = 0.3;
  object.width = object.height = kObjectSize;
  object.dx = kObjectSpeed;
  object.dy = kObjectSpeed / 2;
  scene.AddObject(object);
  int frame = 0;
  ServeMultipart(connection, "image/jpeg", FramePeriod(request, kFps), [&]() -> std::string {
    const CameraStatus status = state.Get();
    if (status.silent) return std::string();
    if (status.motion > 0) scene.Step();
    scene.SetBrightness((frame++ / kLightPeriod) % 2 ? kLightGain : 1.0, 0);
    return scene.Jpeg();
  });
}

}  // namespace

Emulation SceneEmulation() {
  Emulation e = MakeEmulation("scene", "Any", HandleScene,
                             {
                                 {"JpegDiffMD", "motion", {{"stream_buffer", true}}},
                                 {"JpegDiffMD", "motion-shm", nullptr},
                             });
  e.frames = FramesAt(std::string(kStreamPath) + "?fps=" + std::to_string(kFps));
  return e;
}

}  // namespace evsim
