#include "sim/net/rtspserver.h"

#include <algorithm>
#include <cstdlib>
#include <string_view>

#include "host/text/strutil.h"

namespace evsim {

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr size_t kMaxHeadBytes = 64 * 1024;
constexpr size_t kMaxBodyBytes = 64 * 1024;
constexpr char kSessionId[] = "5A1B2C3D";
constexpr char kVideoControl[] = "trackID=1";
constexpr char kAudioControl[] = "trackID=2";
constexpr uint32_t kSsrc = 0x1234ABCD;
constexpr uint32_t kTicksPerPacket = 3600;  // 90 kHz clock at 25 frames a second
constexpr int kRtcpEvery = 10;
// Longest a quiet connection is waited on before the session checks its clock again.
constexpr milliseconds kIdleWait{200};

void Put16(std::string& out, uint32_t value) {
  out += static_cast<char>((value >> 8) & 0xff);
  out += static_cast<char>(value & 0xff);
}

void Put32(std::string& out, uint32_t value) {
  Put16(out, value >> 16);
  Put16(out, value & 0xffff);
}

std::string Interleaved(int channel, const std::string& packet) {
  std::string out = "$";
  out += static_cast<char>(channel);
  Put16(out, static_cast<uint32_t>(packet.size()));
  return out + packet;
}

std::string SenderReport(uint32_t timestamp, uint32_t packets) {
  std::string sr;
  sr += '\x80';
  sr += static_cast<char>(200);
  Put16(sr, 6);  // length in 32-bit words, minus one
  Put32(sr, kSsrc);
  Put32(sr, 0);  // NTP time, not kept by the simulator
  Put32(sr, 0);
  Put32(sr, timestamp);
  Put32(sr, packets);
  Put32(sr, packets * 8);
  return sr;
}

std::string Sdp() {
  return std::string("v=0\r\n") +
         "o=- 1 1 IN IP4 127.0.0.1\r\n"
         "s=camera\r\n"
         "c=IN IP4 0.0.0.0\r\n"
         "t=0 0\r\n"
         "a=control:*\r\n"
         "m=audio 0 RTP/AVP 0\r\n"
         "a=control:" + kAudioControl + "\r\n"
         "m=video 0 RTP/AVP 96\r\n"
         "a=rtpmap:96 MP4V-ES/90000\r\n"
         "a=control:" + kVideoControl + "\r\n";
}

// The request's target with the track control stripped: the presentation it names.
bool NamesTrack(const std::string& target, std::string_view control) {
  return target.size() >= control.size() &&
         target.compare(target.size() - control.size(), control.size(), control) == 0;
}

class Session {
 public:
  Session(TcpConnection& connection, const RtspStream& stream)
      : connection_(connection), stream_(stream) {}

  void Run();

 private:
  // Handles every complete request in in_; false when the session is to end.
  bool HandleRequests();
  bool Handle(const HttpRequest& request);
  bool Answer(const HttpRequest& request, int status, const std::string& headers = "",
              const std::string& body = "");
  bool SendPacket();
  bool Silent() const {
    return stream_.silent_after >= 0 && sent_ >= static_cast<uint64_t>(stream_.silent_after);
  }

  TcpConnection& connection_;
  const RtspStream& stream_;
  std::string in_;               // received bytes not handled yet
  bool set_up_ = false;          // SETUP of the video track succeeded
  bool playing_ = false;         // PLAY succeeded
  uint64_t sent_ = 0;            // RTP packets sent
  Clock::time_point next_packet_;
  Clock::time_point last_request_ = Clock::now();
};

void Session::Run() {
  char chunk[4096];
  for (;;) {
    if (connection_.Stopping() || (stream_.ended && stream_.ended())) return;
    const Clock::time_point now = Clock::now();
    if (!Silent() && stream_.session_timeout > 0 &&
        now - last_request_ > std::chrono::seconds(stream_.session_timeout)) {
      return;
    }
    if (playing_ && !Silent() && now >= next_packet_) {
      if (!SendPacket()) return;
      if (stream_.close_after >= 0 && static_cast<long>(sent_) >= stream_.close_after) {
        connection_.Close();
        return;
      }
      next_packet_ += stream_.period;
      continue;
    }
    milliseconds wait = kIdleWait;
    if (playing_ && !Silent()) {
      wait = std::min(wait, std::chrono::duration_cast<milliseconds>(next_packet_ - now) +
                                milliseconds(1));
    }
    long n = connection_.Read(chunk, sizeof(chunk), wait);
    if (n == 0) return;  // the client closed
    if (n < 0) {
      if (connection_.PeerClosed()) return;
      continue;  // nothing came in time
    }
    if (Silent()) continue;  // a hung camera reads and forgets
    in_.append(chunk, static_cast<size_t>(n));
    if (!HandleRequests()) return;
  }
}

bool Session::HandleRequests() {
  for (;;) {
    size_t crlf = in_.find("\r\n\r\n");
    size_t lf = in_.find("\n\n");
    size_t end = std::string::npos;
    if (crlf != std::string::npos && (lf == std::string::npos || crlf < lf)) {
      end = crlf + 4;
    } else if (lf != std::string::npos) {
      end = lf + 2;
    }
    if (end == std::string::npos) return in_.size() <= kMaxHeadBytes;
    HttpRequest request;
    if (!ParseRequestHead(std::string_view(in_).substr(0, end), request)) return false;
    size_t body = 0;
    const std::string length = request.Header("Content-Length");
    if (!length.empty()) body = std::strtoul(length.c_str(), nullptr, 10);
    if (body > kMaxBodyBytes) return false;
    if (in_.size() < end + body) return true;  // the body is still on its way
    in_.erase(0, end + body);
    last_request_ = Clock::now();
    if (stream_.on_request) stream_.on_request(request);
    if (!Handle(request)) return false;
  }
}

bool Session::Handle(const HttpRequest& request) {
  if (!stream_.auth.Accepts(request)) {
    return Answer(request, 401, stream_.auth.ChallengeHeader() + "\r\n");
  }
  const std::string& method = request.method;
  const bool in_session = TrimBlanks(request.Header("Session")) == kSessionId;
  if (method == "OPTIONS") {
    return Answer(request, 200,
                  "Public: OPTIONS, DESCRIBE, SETUP, PLAY, GET_PARAMETER, TEARDOWN\r\n");
  }
  if (method == "DESCRIBE") {
    std::string base = request.target;
    if (base.empty() || base.back() != '/') base += '/';
    return Answer(request, 200, "Content-Type: application/sdp\r\nContent-Base: " + base + "\r\n",
                  Sdp());
  }
  if (method == "SETUP") {
    const std::string transport = request.Header("Transport");
    if (!NamesTrack(request.target, kVideoControl) ||
        transport.find("RTP/AVP/TCP") == std::string::npos ||
        transport.find("interleaved=0-1") == std::string::npos) {
      return Answer(request, 461);
    }
    set_up_ = true;
    return Answer(request, 200,
                  "Transport: RTP/AVP/TCP;unicast;interleaved=0-1\r\nSession: " +
                      std::string(kSessionId) + ";timeout=" +
                      std::to_string(stream_.session_timeout) + "\r\n");
  }
  if (method == "PLAY") {
    if (!set_up_ || !in_session) return Answer(request, 454);
    const std::string headers = "Session: " + std::string(kSessionId) + "\r\nRange: npt=0.000-\r\n";
    if (!Answer(request, 200, headers)) return false;
    if (!playing_) next_packet_ = Clock::now();
    playing_ = true;
    return true;
  }
  if (method == "GET_PARAMETER") {
    if (!stream_.get_parameter) return Answer(request, 405);
    if (!in_session) return Answer(request, 454);
    return Answer(request, 200, "Session: " + std::string(kSessionId) + "\r\n");
  }
  if (method == "TEARDOWN") {
    Answer(request, 200);
    return false;
  }
  return Answer(request, 405);
}

bool Session::Answer(const HttpRequest& request, int status, const std::string& headers,
                     const std::string& body) {
  std::string out = "RTSP/1.0 " + std::to_string(status) + " " +
                    (status == 461 ? "Unsupported Transport"
                                   : status == 454 ? "Session Not Found" : ReasonPhrase(status)) +
                    "\r\n";
  out += "CSeq: " + std::string(TrimBlanks(request.Header("CSeq"))) + "\r\n";
  out += headers;
  if (!body.empty()) out += "Content-Length: " + std::to_string(body.size()) + "\r\n";
  out += "\r\n" + body;
  return connection_.Write(out);
}

bool Session::SendPacket() {
  const uint32_t timestamp = static_cast<uint32_t>(sent_) * kTicksPerPacket;
  std::optional<std::string> packet;
  if (stream_.raw_packet) packet = stream_.raw_packet(sent_);
  if (!packet) {
    std::optional<std::string> extension;
    if (stream_.extension) extension = stream_.extension(sent_);
    packet = MakeRtpPacket(static_cast<uint16_t>(sent_), timestamp, extension);
  }
  std::string out = Interleaved(0, *packet);
  ++sent_;
  if (sent_ % kRtcpEvery == 0) {
    out += Interleaved(1, SenderReport(timestamp, static_cast<uint32_t>(sent_)));
  }
  return connection_.Write(out);
}

}  // namespace

std::string MakeRtpPacket(uint16_t sequence, uint32_t timestamp,
                          const std::optional<std::string>& extension) {
  std::string packet;
  packet += static_cast<char>(extension ? 0x90 : 0x80);  // version 2, extension bit
  packet += static_cast<char>(0x80 | 96);                // marker, dynamic payload type
  Put16(packet, sequence);
  Put32(packet, timestamp);
  Put32(packet, kSsrc);
  if (extension) {
    std::string data = *extension;
    data.resize((data.size() + 3) / 4 * 4, '\0');
    Put16(packet, kRtpExtensionProfile);
    Put16(packet, static_cast<uint32_t>(data.size() / 4));
    packet += data;
  }
  packet += std::string("\x00\x00\x01\xb6\x10\x20\x30\x40", 8);  // start of an MPEG-4 VOP
  return packet;
}

void ServeRtspSession(TcpConnection& connection, const RtspStream& stream) {
  Session(connection, stream).Run();
}

}  // namespace evsim
