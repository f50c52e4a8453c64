// Cameras that follow the PSIA event model: motion and alarm inputs come as records of the
// alert stream at /PSIA/Custom/Event/notification/alertStream on the camera's own port (see
// sim/alertstream.h), in the PSIA record namespace.

#include "sim/makers/alertstream.h"
#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kAlertStreamPath[] = "/PSIA/Custom/Event/notification/alertStream";

void HandlePsia(HttpConnection& connection, CameraState& state) {
  const HttpRequest& request = connection.Request();
  if (request.method != "GET" || request.Path() != kAlertStreamPath) {
    connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
    return;
  }
  AlertStreamStyle style;
  style.xml_namespace = "urn:psialliance-org";
  style.mac = "00:40:8c:5a:00:02";
  ServeAlertStream(connection, state, style);
}

}  // namespace

Emulation PsiaEmulation() {
  Emulation e;
  e.key = "psia";
  e.maker = "PSIA";
  e.classes = {"PSIAMD", "PSIAEID"};
  e.handle = HandlePsia;
  e.detectors = {
      {"PSIAMD", "motion", nullptr},
      {"PSIAEID", "inputs", {{"inputs", 1}}},
  };
  return e;
}

}  // namespace evsim
