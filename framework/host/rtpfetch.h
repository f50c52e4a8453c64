// RTP reader of the host: RtpFetch holds an RTSP session with a camera and delivers the RTP
// packets of its video track one at a time, for the detectors that read the event state a
// camera puts into the header extension of its RTP packets.
//
// Transport: RTP interleaved over the RTSP connection (RTP/AVP/TCP, channels 0 and 1), so
// one TCP connection to the camera's RTSP port carries requests and media alike: it passes
// firewalls and NAT like any TCP connection, loses no packet, and needs no UDP ports of our
// own. The session is set up by the first NextHdrInfo (or ReadPartHeader): OPTIONS,
// DESCRIBE, SETUP of the first video track of the description, PLAY. While packets are read,
// a GET_PARAMETER (OPTIONS, once the camera has refused GET_PARAMETER) keeps the session
// alive before the timeout that the camera announced in its SETUP answer (60 s when it names
// none) runs out. Deleting the reader ends the session with TEARDOWN, unless the connection
// has already failed. The user name and password answer a Basic or Digest challenge;
// clientName is sent as the User-Agent of every request (cameras log it, and some choose
// their stream by it).
//
// Failures: the session could not be set up, the camera closed the connection, no packet
// came within the time-out, or it sent something that is not RTSP. Any of them ends the
// session, and every later call fails: the owner deletes the reader and makes a new one to
// try again. Packets on the RTCP channel, packets that are not RTP version 2 and packets
// whose CSRC list, extension or padding do not fit them are passed over; at most kMaxQueued
// received packets wait to be read, older ones are dropped.
//
// A reader belongs to one thread at a time. Its calls block that thread: each request (the
// set-up's, a keep-alive, TEARDOWN at most 2 s) and each wait for a packet is bounded by the
// time-out.

#ifndef EVWATCH_FRAMEWORK_HOST_RTPFETCH_H_
#define EVWATCH_FRAMEWORK_HOST_RTPFETCH_H_

#include <memory>
#include <string>

#include "framework/host/fetcher.h"

class RtspSession;

class RtpFetch : public FetcherBase {
 public:
  // Seconds that each request and each wait for a packet may take.
  static constexpr int kDefaultTimeout = 10;
  // Received packets held before the oldest are dropped.
  static constexpr int kMaxQueued = 1024;

  // path: the stream's path on the camera (with its query; a leading "/" is added when
  // missing), or a whole "rtsp://" URL. No I/O here.
  RtpFetch(std::string host, int port, std::string path, std::string user, std::string password,
           std::string clientName);
  // The same with another time-out, in seconds (values below 1 count as 1).
  RtpFetch(std::string host, int port, std::string path, std::string user, std::string password,
           std::string clientName, int timeout);
  RtpFetch(const RtpFetch&) = delete;
  RtpFetch& operator=(const RtpFetch&) = delete;
  ~RtpFetch() override;

  // Moves to the next RTP packet of the video track and gives the length in bytes of its
  // header-extension data (after the extension's own four-byte header; 0 when the packet has
  // no extension). 0 = a packet is current.
  int NextHdrInfo(unsigned int& extLength);
  // Copies the first `length` bytes of the current packet's extension data into buffer.
  // 0 = copied; non-zero when no packet is current, buffer is null, length is 0 or more
  // than the extension holds. The session is not harmed by a refused copy.
  int FetchExtData(unsigned char* buffer, unsigned int length);

  // The part view of the same stream: a part is one packet, its body the packet's payload
  // (after the header, its extension and before any padding). The header text is empty: an
  // RTP header is binary.
  int ReadPartHeader(int* length, char* header, int headerSize) override;
  // Copies `length` bytes of the current payload, from where the last call stopped.
  int ReadPartBody(char* buffer, int length) override;
  // Drops the current packet; the arguments are not used. Always 0.
  int SkipContent(char* buffer, int length) override;

 private:
  std::unique_ptr<RtspSession> session_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_RTPFETCH_H_
