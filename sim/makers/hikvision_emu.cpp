// HikVision network cameras: motion and alarm inputs come as records of the alert stream at
// /Event/notification/alertStream on the camera's own port (see sim/alertstream.h), in the
// HikVision record namespace.

#include "sim/makers/alertstream.h"
#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kAlertStreamPath[] = "/Event/notification/alertStream";

void HandleHikVision(HttpConnection& connection, CameraState& state) {
  const HttpRequest& request = connection.Request();
  if (request.method != "GET" || request.Path() != kAlertStreamPath) {
    connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
    return;
  }
  AlertStreamStyle style;
  style.xml_namespace = "http://www.hikvision.com/ver10/XMLSchema";
  style.mac = "44:19:b6:5a:00:01";
  ServeAlertStream(connection, state, style);
}

}  // namespace

Emulation HikVisionEmulation() {
  Emulation e;
  e.key = "hikvision";
  e.maker = "HikVision";
  e.classes = {"HikVisionMD", "HikVisionEID"};
  e.handle = HandleHikVision;
  e.detectors = {
      {"HikVisionMD", "motion", nullptr},
      {"HikVisionEID", "inputs", {{"inputs", 1}}},
  };
  return e;
}

}  // namespace evsim
