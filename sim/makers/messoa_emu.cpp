// Messoa network cameras: the alarm status at
// /cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus, a section header and the line
// "Mode=N": 1 while an input is active, 2 while the camera sees motion, 3 for both, 0 for
// neither. Other groups get 400.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kParamPath[] = "/cgi-bin/admin/param.cgi";
constexpr char kStatusQuery[] = "type=Get&group=AlarmStatus";

int Mode(const CameraStatus& status) { return (status.AnyInput() ? 1 : 0) + (status.motion > 0 ? 2 : 0); }

void HandleMessoa(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kParamPath)) return;
  const std::string target = connection.Request().target;
  if (target != std::string(kParamPath) + "?" + kStatusQuery) {
    connection.Write(MakeResponse(400, "text/plain", "unknown group\r\n"));
    return;
  }
  const std::string body = "[AlarmStatus]\r\nMode=" + std::to_string(Mode(state.Get())) + "\r\n";
  connection.Write(MakeResponse(200, "text/plain", body));
}

}  // namespace

Emulation MessoaEmulation() {
  return MakeEmulation("messoa", "Messoa", HandleMessoa,
                       {
                           {"MessoaMD", "motion", nullptr},
                           {"MessoaEID", "inputs", {{"inputs", 1}}},
                       });
}

}  // namespace evsim
