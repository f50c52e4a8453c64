// HikVision network cameras and cameras that follow the PSIA event model: motion and alarm
// inputs come as records of the alert stream on the camera's own port (see
// sim/makers/alertstream.h). The two differ only in the stream's path, the record namespace
// and the camera's MAC address in each record.

#include "sim/emulation.h"
#include "sim/makers/alertstream.h"

namespace evsim {
namespace {

struct AlertStreamMaker {
  const char* key;
  const char* maker;
  const char* motion_class;
  const char* input_class;
  const char* path;
  const char* xml_namespace;
  const char* mac;
};

constexpr AlertStreamMaker kHikVision{
    "hikvision", "HikVision", "HikVisionMD", "HikVisionEID", "/Event/notification/alertStream",
    "http://www.hikvision.com/ver10/XMLSchema", "44:19:b6:5a:00:01"};
constexpr AlertStreamMaker kPsia{
    "psia", "PSIA", "PSIAMD", "PSIAEID", "/PSIA/Custom/Event/notification/alertStream",
    "urn:psialliance-org", "00:40:8c:5a:00:02"};

Emulation AlertStreamEmulation(const AlertStreamMaker& m) {
  auto handle = [&m](HttpConnection& connection, CameraState& state) {
    if (!ServesGetOf(connection, m.path)) return;
    AlertStreamStyle style;
    style.xml_namespace = m.xml_namespace;
    style.mac = m.mac;
    ServeAlertStream(connection, state, style);
  };
  return MakeEmulation(m.key, m.maker, handle,
                       {
                           {m.motion_class, "motion", nullptr},
                           {m.input_class, "inputs", {{"inputs", 1}}},
                       });
}

}  // namespace

Emulation HikVisionEmulation() { return AlertStreamEmulation(kHikVision); }
Emulation PsiaEmulation() { return AlertStreamEmulation(kPsia); }

}  // namespace evsim
