// One RTSP session of a simulated camera on an accepted TCP connection (RFC 2326), for the
// camera emulations and the tests of the RTP reader.
//
// The camera answers OPTIONS, DESCRIBE (an SDP with an audio track and an MPEG-4 video
// track, in that order), SETUP of the video track with RTP interleaved over this connection
// (channels 0-1; any other transport or track gets 461), PLAY, GET_PARAMETER and TEARDOWN;
// other methods get 405. Every request is authenticated like an HTTP request (Basic or
// Digest), and every answer carries the request's CSeq. After PLAY it sends one RTP packet per
// period on channel 0, carrying the header extension that `extension` gives for it, and an
// RTCP sender report on channel 1 after every tenth packet. A session whose client sends no
// request for the timeout announced in SETUP is closed, as cameras do.
//
// Threads: ServeRtspSession runs on the connection's session thread; the callbacks of
// RtspStream are called on that thread.

#ifndef EVWATCH_SIM_NET_RTSPSERVER_H_
#define EVWATCH_SIM_NET_RTSPSERVER_H_

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"
#include "sim/net/tcpserver.h"

namespace evsim {

// Profile-defined field of the header extensions the camera sends ("VV").
inline constexpr uint16_t kRtpExtensionProfile = 0x5656;

struct RtspStream {
  HttpAuth auth;  // kNone: any client
  // Announced in SETUP's Session header, and enforced: seconds without a request after
  // which the camera ends the session.
  int session_timeout = 60;
  std::chrono::milliseconds period{40};  // between two RTP packets
  // The header-extension data of packet n (from 0), padded by the server with zeros to a
  // multiple of four bytes; nullopt for a packet without extension. Unset: none has one.
  std::function<std::optional<std::string>(uint64_t n)> extension;
  // Optional: the whole RTP packet n as the camera sends it, in place of the one made from
  // `extension` (for malformed or unusual packets); nullopt: the made one.
  std::function<std::optional<std::string>(uint64_t n)> raw_packet;
  bool get_parameter = true;  // false: GET_PARAMETER is answered 405, as some cameras do
  long close_after = -1;   // packets sent before the camera closes the connection; -1: never
  long silent_after = -1;  // packets sent before the camera hangs (sends and answers nothing)
  std::function<bool()> ended;  // polled; true ends the session (the camera fell silent)
  std::function<void(const HttpRequest&)> on_request;  // each request as it arrives
};

// Serves the session until the client tears it down or closes, the session times out, one
// of the stream's limits ends it, or the server stops.
void ServeRtspSession(TcpConnection& connection, const RtspStream& stream);

// One RTP packet (version 2, payload type 96, marker set) as the camera sends it, without the
// interleaved framing: sequence number, timestamp, the header extension (padded to four
// bytes) when there is one, and a few payload bytes.
std::string MakeRtpPacket(uint16_t sequence, uint32_t timestamp,
                          const std::optional<std::string>& extension);

}  // namespace evsim

#endif  // EVWATCH_SIM_NET_RTSPSERVER_H_
