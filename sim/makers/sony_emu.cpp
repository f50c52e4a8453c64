// Sony network cameras: alarm data pushed at /command/alarmdata.cgi on the camera's own
// port, a part every second with the lines "OdWin1=V" (the object-detection window, 1 while
// the motion level is above 20 %), "OdWin2=0" (a quiet window) and "Sensor1=V",
// "Sensor2=V" for alarm inputs 1 and 2.

#include <chrono>
#include <string>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kAlarmDataPath[] = "/command/alarmdata.cgi";
constexpr int kMotionThreshold = 20;
constexpr int kSensors = 2;
constexpr std::chrono::milliseconds kPeriod{1000};

std::string AlarmData(const CameraStatus& status) {
  std::string text = "OdWin1=" + std::to_string(status.motion > kMotionThreshold ? 1 : 0) +
                     "\r\nOdWin2=0\r\n";
  for (int n = 1; n <= kSensors; ++n) {
    text += "Sensor" + std::to_string(n) + "=" + (status.Input(n) ? "1" : "0") + "\r\n";
  }
  return text;
}

void HandleSony(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kAlarmDataPath)) return;
  ServeMultipart(connection, "text/plain", kPeriod, [&]() -> std::string {
    const CameraStatus status = state.Get();
    return status.silent ? std::string() : AlarmData(status);
  });
}

}  // namespace

Emulation SonyEmulation() {
  return MakeEmulation("sony", "Sony", HandleSony,
                       {
                           {"SONYMD", "motion", nullptr},
                           {"SONYEID", "inputs", {{"inputs", 2}}},
                       });
}

}  // namespace evsim
