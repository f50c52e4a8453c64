// D-Link network cameras. /config/notify.cgi lists the camera's event state as key=value
// lines: md1 (on while motion window 1 sees motion) with its measured level mdv1 right after
// it, then the digital inputs input1 and input2, then the rest of the notification state.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kNotifyPath[] = "/config/notify.cgi";
constexpr int kDLinkInputs = 2;  // the DCS models have two contact inputs

std::string NotifyBody(const CameraStatus& status) {
  std::string body = "md1=" + std::string(status.motion > 0 ? "on" : "off") + "\r\n";
  body += "mdv1=" + std::to_string(status.motion) + "\r\n";
  for (int n = 1; n <= kDLinkInputs; ++n) {
    body += "input" + std::to_string(n) + "=" + (status.Input(n) ? "on" : "off") + "\r\n";
  }
  body +=
      "output1=off\r\n"
      "recording=off\r\n"
      "snapshot=off\r\n"
      "audio=off\r\n"
      "videoloss=off\r\n"
      "schedule=on\r\n"
      "cameraname=DCS-SIM\r\n";
  return body;
}

void HandleDLink(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kNotifyPath)) return;
  connection.Write(MakeResponse(200, "text/plain", NotifyBody(state.Get())));
}

}  // namespace

Emulation DLinkEmulation() {
  return MakeEmulation("dlink", "D-Link", HandleDLink,
                       {
                           {"DLinkMD", "motion", nullptr},
                           {"DLINKEID", "inputs", {{"inputs", kDLinkInputs}}},
                       });
}

}  // namespace evsim
