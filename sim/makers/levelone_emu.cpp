// LevelOne network cameras: the motion-window settings at
// /cgi-bin/admin/param?action=list&group=Motion (window M0 on with threshold 50, M1 and M2
// off), the live window readings as one line "R1=a,R2=b,R3=c" on TCP port 19999 (R1 is ten
// times the scene's motion level, so the detector's level is that level), and the inputs at
// /io/query_io.cgi, one line "input_N=0|1" per input.
//
// Port 19999 is fixed on the camera, so a simulated LevelOne camera serves it only on an
// address of its own (camsim --fixed-port-host); without one it serves HTTP only.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kParamPath[] = "/cgi-bin/admin/param";
constexpr char kMotionQuery[] = "action=list&group=Motion";
constexpr char kInputPath[] = "/io/query_io.cgi";
constexpr int kReadingPort = 19999;

const char kSettings[] =
    "M0.Enabled=yes\r\n"
    "M0.Sensitivity=80\r\n"
    "M0.Threshold=50\r\n"
    "M0.Left=0\r\n"
    "M0.Top=0\r\n"
    "M0.Right=639\r\n"
    "M0.Bottom=479\r\n"
    "M1.Enabled=no\r\n"
    "M2.Enabled=no\r\n";

std::string InputLines(const CameraStatus& status) {
  std::string body;
  for (int n = 1; n <= kInputCount; ++n) {
    body += "input_" + std::to_string(n) + "=" + (status.Input(n) ? "1" : "0") + "\r\n";
  }
  return body;
}

void HandleLevelOne(HttpConnection& connection, CameraState& state) {
  const HttpRequest& request = connection.Request();
  if (request.method == "GET" && request.Path() == kInputPath) {
    connection.Write(MakeResponse(200, "text/plain", InputLines(state.Get())));
    return;
  }
  if (!ServesGetOf(connection, kParamPath)) return;
  if (request.target != std::string(kParamPath) + "?" + kMotionQuery) {
    connection.Write(MakeResponse(400, "text/plain", "unknown group\r\n"));
    return;
  }
  connection.Write(MakeResponse(200, "text/plain", kSettings));
}

// One reading line per connection, then the camera closes it.
void ServeReadings(TcpConnection& connection, CameraState& state, const Login&) {
  const int motion = state.Get().motion;
  connection.Write("R1=" + std::to_string(motion * 10) + ",R2=0,R3=0\r\n");
}

}  // namespace

Emulation LevelOneEmulation() {
  Emulation e = MakeEmulation("levelone", "LevelOne", HandleLevelOne,
                              {
                                  {"LevelOneGr2MD", "motion", nullptr},
                                  {"LevelOneGr1EID", "inputs", {{"inputs", 1}}},
                              });
  e.tcp_service = ServeReadings;
  e.fixed_tcp_port = kReadingPort;
  return e;
}

}  // namespace evsim
