// Mobotix network cameras. /control/event.jpg?output=alarmupdate&filter=VM (video motion) or
// filter=SI (signal input) answers one text line that begins with the camera's alarm counter
// for that kind of event: "alarmcounter=N;alarmimage=0". The camera counts one more alarm for
// each update asked while the event is on (motion, or input 1), so a watcher sees the counter
// move for as long as the event lasts and stand still once it is over.

#include <map>
#include <mutex>
#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kEventPath[] = "/control/event.jpg";

struct AlarmCounters {
  int motion = 0;
  int input = 0;
};

// The counters of every simulated camera, kept beside the shared camera state.
int NextCounter(const CameraState& state, bool motion, bool active) {
  static std::mutex mutex;
  static std::map<const CameraState*, AlarmCounters> counters;
  std::lock_guard<std::mutex> lock(mutex);
  AlarmCounters& c = counters[&state];
  int& counter = motion ? c.motion : c.input;
  if (active) ++counter;
  return counter;
}

void HandleMobotix(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kEventPath)) return;
  const std::string& target = connection.Request().target;
  const bool motion = target.find("filter=VM") != std::string::npos;
  const bool input = target.find("filter=SI") != std::string::npos;
  if (target.find("output=alarmupdate") == std::string::npos || motion == input) {
    AnswerNotFound(connection);
    return;
  }
  const CameraStatus status = state.Get();
  const int counter = NextCounter(state, motion, motion ? status.motion > 0 : status.Input(1));
  connection.Write(MakeResponse(200, "text/plain",
                                "alarmcounter=" + std::to_string(counter) + ";alarmimage=0\r\n"));
}

}  // namespace

Emulation MobotixEmulation() {
  return MakeEmulation("mobotix", "Mobotix", HandleMobotix,
                       {
                           {"MobotixMD", "motion", {{"type", 0}}},
                           {"MobotixMD", "input", {{"type", 1}}},
                       });
}

}  // namespace evsim
