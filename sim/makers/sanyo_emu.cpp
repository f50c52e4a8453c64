// Sanyo network cameras. The status CGI, whose path the camera's API block names, answers a
// 48-byte binary record: byte 33 holds the alarm inputs (bit N-1 for input N), byte 34 the
// motion state (bit 1 while the camera sees motion); the other bytes are constant here.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kStatusPath[] = "/cgi-bin/camstatus.cgi";
constexpr char kStatusQuery[] = "format=bin";
constexpr int kRecordSize = 48;
constexpr int kInputByte = 33;
constexpr int kMotionByte = 34;
constexpr int kSanyoInputs = 4;

std::string StatusRecord(const CameraStatus& status) {
  std::string record(kRecordSize, '\0');
  record[0] = 'S';
  record[1] = 'C';
  record[2] = 1;  // record version
  int inputs = 0;
  for (int n = 1; n <= kSanyoInputs; ++n) {
    if (status.Input(n)) inputs |= 1 << (n - 1);
  }
  record[kInputByte] = static_cast<char>(inputs);
  // Bit 0 says that motion detection is enabled; bit 1 is the motion itself.
  record[kMotionByte] = static_cast<char>(0x01 | (status.motion > 0 ? 0x02 : 0));
  return record;
}

void HandleSanyo(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kStatusPath)) return;
  connection.Write(MakeResponse(200, "application/octet-stream", StatusRecord(state.Get())));
}

nlohmann::json SanyoApi(int port) {
  const std::string path = std::string(kStatusPath + 1) + "?" + kStatusQuery;  // relative
  return {{"name", "sanyo"}, {"stream", {{"path", path}, {"port", port}}}};
}

}  // namespace

Emulation SanyoEmulation() {
  Emulation e = MakeEmulation("sanyo", "Sanyo", HandleSanyo,
                             {
                                 {"SanyoMD", "motion", nullptr},
                                 {"SanyoEID", "inputs", {{"inputs", kSanyoInputs}}},
                             });
  e.api = SanyoApi;
  return e;
}

}  // namespace evsim
