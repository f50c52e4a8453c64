// Vivotek network cameras: a motion-JPEG stream at /video.mjpg whose frames carry the motion
// state in two records, one for each firmware generation, so that detectors of either
// function group read the same stream (each keeps only its own marker's segments):
//   APP0: "VVTK", then bit 0 of byte 6 set while there is motion and the level in the low
//         nibble of byte 7 (level = nibble x 6 + 6);
//   APP2: "VIVO" and the tag "jpeg", 11 bytes later a record count (1), then the record:
//         a valid bit, a trigger bit and a 7-bit level (0..127), most significant bit first.
// The frames have no JFIF header: its APP0 would come before the camera's own.
// The digital inputs answer at two CGIs, one per firmware family: /cgi-bin/getdi.cgi?diN
// (N from 1) says "DIN=H" or "DIN=L", /cgi-bin/dido/getdi.cgi?diN (N from 0) "diN=1" or
// "diN=0".

#include <algorithm>
#include <string>
#include <vector>

#include "sim/emulation.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/video.mjpg";
constexpr char kInputPathFromOne[] = "/cgi-bin/getdi.cgi";
constexpr char kInputPathFromZero[] = "/cgi-bin/dido/getdi.cgi";
constexpr int kFps = 10;
constexpr int kBufferFps = 100;  // the receiver of the frame buffer reads at full speed

std::string App0Record(const CameraStatus& status) {
  std::string r(16, '\0');
  r.replace(0, 4, "VVTK");
  if (status.motion > 0) {
    r[6] = 0x01;
    const int nibble = status.motion < 6 ? 0 : (status.motion - 6 + 3) / 6;
    r[7] = static_cast<char>(nibble > 15 ? 15 : nibble);
  }
  return r;
}

std::string App2Record(const CameraStatus& status) {
  std::string r = "VIVOjpeg";
  r += std::string(11, '\0');
  r += '\x01';  // one record
  const int level = status.motion * 127 / 100;
  const bool trigger = status.motion > 0;
  std::string record(4, '\0');
  record[0] = static_cast<char>(0x80 | (trigger ? 0x40 : 0) | (level >> 1));
  record[1] = static_cast<char>((level & 1) << 7);
  return r + record;
}

// Answers an input CGI of either family; false, writing nothing, for any other request.
bool AnswerInput(HttpConnection& connection, const CameraState& state) {
  const HttpRequest& request = connection.Request();
  const std::string path = request.Path();
  const bool fromOne = path == kInputPathFromOne;
  if (request.method != "GET" || (!fromOne && path != kInputPathFromZero)) return false;
  const std::string query = request.target.substr(std::min(request.target.size(), path.size() + 1));
  int index = -1;
  if (query.size() > 2 && query.compare(0, 2, "di") == 0 &&
      query.find_first_not_of("0123456789", 2) == std::string::npos && query.size() < 6) {
    index = std::stoi(query.substr(2));
  }
  const int input = fromOne ? index : index + 1;
  if (index < 0 || input < 1 || input > kInputCount) {
    connection.Write(MakeResponse(400, "text/plain", "bad input\r\n"));
    return true;
  }
  const bool active = state.Get().Input(input);
  const std::string number = std::to_string(index);
  const std::string line = fromOne ? "DI" + number + "=" + (active ? "H" : "L")
                                   : "di" + number + "=" + (active ? "1" : "0");
  connection.Write(MakeResponse(200, "text/plain", line + "\r\n"));
  return true;
}

void HandleVivotek(HttpConnection& connection, CameraState& state) {
  if (AnswerInput(connection, state)) return;
  if (!ServesGetOf(connection, kStreamPath)) return;
  const HttpRequest& request = connection.Request();
  ServeEventFrames(connection, state, FramePeriod(request, kFps), [](const CameraStatus& status) {
    return std::vector<JpegSegment>{{kJpegApp0, App0Record(status)},
                                    {kJpegApp2, App2Record(status)}};
  });
}

}  // namespace

Emulation VivotekEmulation() {
  // One reader of the camera's own stream (APP0) and one of the frame buffer (APP2).
  Emulation e = MakeEmulation("vivotek", "Vivotek", HandleVivotek,
                             {
                                 {"VivotekJpgMD", "motion", {{"function_group", 0}}},
                                 {"VivotekJpgMD", "motion-app2", {{"function_group", 1}, {"stream_buffer", true}}},
                                 {"VivotekEID", "inputs", {{"function_group", 0}, {"inputs", 2}}},
                             });
  e.api = StreamApi(kStreamPath);
  e.frames = FramesAt(std::string(kStreamPath) + "?fps=" + std::to_string(kBufferFps));
  return e;
}

}  // namespace evsim
