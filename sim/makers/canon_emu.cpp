// Canon network cameras: one plain-text CGI, /-wvhttp-01-/info.cgi, that lists the camera's
// state as name:=value lines. Motion is m.1 (1 while the camera sees motion); the alarm
// inputs are i.1, i.2, ... counted from 1.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kInfoPath[] = "/-wvhttp-01-/info.cgi";
constexpr int kCanonInputs = 4;  // the VB series has up to four contact inputs

std::string InfoBody(const CameraStatus& status) {
  std::string body =
      "s.hardware:=VB-SIM\r\n"
      "s.firmware:=1.0\r\n"
      "s.product:=Simulated Canon camera\r\n";
  body += "m.1:=" + std::string(status.motion > 0 ? "1" : "0") + "\r\n";
  for (int n = 1; n <= kCanonInputs; ++n) {
    body += "i." + std::to_string(n) + ":=" + (status.Input(n) ? "1" : "0") + "\r\n";
  }
  body += "o.1:=0\r\n";
  return body;
}

void HandleCanon(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kInfoPath)) return;
  connection.Write(MakeResponse(200, "text/plain", InfoBody(state.Get())));
}

}  // namespace

Emulation CanonEmulation() {
  return MakeEmulation("canon", "Canon", HandleCanon,
                       {
                           {"CanonMD", "motion", nullptr},
                           {"CanonEID", "inputs", {{"inputs", 1}}},
                       });
}

}  // namespace evsim
