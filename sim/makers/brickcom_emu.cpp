// Brickcom network cameras. /cgi-bin/gpio.cgi?action=get lists the state of the digital
// inputs and outputs as text entries "diN.status=V" and "doN.status=V", one a line. An input
// reads 0 while active (its contact is open) and 1 while idle.
//
// The CGI answers after 50 ms, about what such a camera takes to gather its GPIO state. A
// watching detector asks again as soon as it has an answer, so this is also what paces it.

#include <chrono>
#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kGpioPath[] = "/cgi-bin/gpio.cgi";
constexpr int kBrickcomInputs = 2;
constexpr std::chrono::milliseconds kAnswerTime{50};

std::string GpioBody(const CameraStatus& status) {
  std::string body;
  for (int n = 1; n <= kBrickcomInputs; ++n) {
    body += "di" + std::to_string(n) + ".status=" + (status.Input(n) ? "0" : "1") + "\n";
  }
  body += "do1.status=1\n";
  return body;
}

void HandleBrickcom(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kGpioPath)) return;
  if (connection.Request().target.find("action=get") == std::string::npos) {
    AnswerNotFound(connection);
    return;
  }
  if (!connection.SleepFor(kAnswerTime)) return;
  connection.Write(MakeResponse(200, "text/plain", GpioBody(state.Get())));
}

}  // namespace

Emulation BrickcomEmulation() {
  Emulation e = MakeEmulation("brickcom", "Brickcom", HandleBrickcom,
                              {
                                  {"BrickcomEID", "inputs", {{"inputs", kBrickcomInputs}}},
                              });
  // The detector only checks that the camera has an API; it asks its fixed CGI.
  e.api = StreamApi("/cgi-bin/gpio.cgi?action=get", "brickcom");
  return e;
}

}  // namespace evsim
