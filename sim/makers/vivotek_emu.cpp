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
//
// The camera's MPEG-4 stream is served over RTSP on a port of its own (/live.sdp, RTP
// interleaved over the RTSP connection, 25 packets a second): every RTP packet carries in its
// header extension the same record after the tag "mp4v", one byte and a zero byte. The
// camera has stream type 1 and video type 1; its API names the RTSP stream for (1, 1).
// When the simulator asks for credentials, the RTSP server asks for them by Digest.

#include <algorithm>
#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "sim/emulation.h"
#include "sim/net/rtspserver.h"
#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr char kStreamPath[] = "/video.mjpg";
constexpr char kInputPathFromOne[] = "/cgi-bin/getdi.cgi";
constexpr char kInputPathFromZero[] = "/cgi-bin/dido/getdi.cgi";
constexpr int kFps = 10;
constexpr int kBufferFps = 100;  // the receiver of the frame buffer reads at full speed
constexpr char kRtspPath[] = "/live.sdp";
constexpr int kVideoType = 1;
constexpr int kRtpStreamType = 1;  // the stream whose packets carry the extension
constexpr std::chrono::milliseconds kPacketPeriod{40};

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

// The record after a tag: `lead` runs from the tag's start up to the record count (15
// bytes), then the count (1) and the record: valid bit, trigger bit, 7-bit level.
std::string TaggedRecord(const std::string& lead, const CameraStatus& status) {
  std::string r = lead;
  r += '\x01';  // one record
  const int level = status.motion * 127 / 100;
  const bool trigger = status.motion > 0;
  std::string record(4, '\0');
  record[0] = static_cast<char>(0x80 | (trigger ? 0x40 : 0) | (level >> 1));
  record[1] = static_cast<char>((level & 1) << 7);
  return r + record;
}

std::string App2Record(const CameraStatus& status) {
  return "VIVO" + TaggedRecord("jpeg" + std::string(11, '\0'), status);
}

std::string Mp4Record(const CameraStatus& status) {
  return TaggedRecord(std::string("mp4v") + 'V' + '\0' + std::string(9, '\0'), status);
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

// One RTSP session whose packets follow the camera's motion; it ends when the camera falls
// silent.
void ServeRtsp(TcpConnection& connection, CameraState& state, const Login& login) {
  RtspStream stream;
  if (login.required) stream.auth = HttpAuth(AuthScheme::kDigest, login.user, login.password);
  stream.period = kPacketPeriod;
  stream.extension = [&state](uint64_t) {
    return std::optional<std::string>(Mp4Record(state.Get()));
  };
  stream.ended = [&state] { return state.Get().silent; };
  ServeRtspSession(connection, stream);
}

}  // namespace

Emulation VivotekEmulation() {
  // One reader of the camera's own stream (APP0) and one of the frame buffer (APP2).
  Emulation e = MakeEmulation("vivotek", "Vivotek", HandleVivotek,
                             {
                                 {"VivotekJpgMD", "motion", {{"function_group", 0}}},
                                 {"VivotekJpgMD", "motion-app2", {{"function_group", 1}, {"stream_buffer", true}}},
                                 {"VivotekEID", "inputs", {{"function_group", 0}, {"inputs", 2}}},
                                 {"VivotekMp4MD", "motion-rtp", {{"function_group", 0}}},
                             });
  e.api = StreamApi(kStreamPath);
  e.tcp_service = ServeRtsp;
  e.api_with_tcp_port = [](int port, int tcp_port) {
    nlohmann::json api = StreamApi(kStreamPath)(port);
    api["streams"][std::to_string(kVideoType) + ",1"] = {{"path", kRtspPath}, {"port", tcp_port}};
    return api;
  };
  e.stream_type = kRtpStreamType;
  e.video_type = kVideoType;
  e.frames = FramesAt(std::string(kStreamPath) + "?fps=" + std::to_string(kBufferFps));
  return e;
}

}  // namespace evsim
