// HTTP client of the host, one request per object, pulled from the calling thread.
//
// A detector creates a VoHttpClient for each request, sends it, checks the answer, reads
// the body in pieces or lines, and deletes the client. Everything runs on the calling thread
// (libcurl's multi interface is driven from inside each call); nothing runs in the
// background. One client belongs to one thread at a time.
//
// Time-out: `timeout` is in seconds (at least 1) and bounds the connection and each wait
// for data, not the whole transfer: a camera that keeps sending never times out, one that
// falls silent for `timeout` seconds does.
//
// The path may come with or without a leading "/" and carries its query; it is requested
// as "/path" on host:port. Hosts may be names, IPv4 or IPv6 literals (with or without
// brackets). User name and password, when the user name is not empty, answer a Basic or
// Digest challenge, whichever the camera asks for; they may hold any characters.

#ifndef EVWATCH_FRAMEWORK_HOST_HTTPCLIENT_H_
#define EVWATCH_FRAMEWORK_HOST_HTTPCLIENT_H_

#include <memory>
#include <string>

#include "framework/host/hosttypes.h"

class HttpPull;

class VoHttpClient {
 public:
  VoHttpClient(std::string host, int port, std::string path, std::string user,
               std::string password, int timeout);
  VoHttpClient(const VoHttpClient&) = delete;
  VoHttpClient& operator=(const VoHttpClient&) = delete;
  virtual ~VoHttpClient();

  // Sends the request and returns once the final response's headers are in. One request
  // per client: a second call fails.
  // 0 = sent and headers received; -1 = connection failure, time-out or bad method.
  int SendRequest(__tag_VO_HTTP_METHOD method);
  // 0 when the response status is 2xx; -1 otherwise (also before SendRequest). The status
  // code (0 when none) is written to `status` either way.
  int CheckResponse(int& status);
  // The value of a response header (HTTP_CONTENT_TYPE: Content-Type). 0 = found.
  int GetHttpContent(__tag_HTTP_MAP_KEY key, std::string& value);
  // Reads body bytes until `size` are in or the body ends. Returns the count read (0 when
  // the body had already ended); after a time-out the count read so far, or negative when
  // nothing came. Negative when the transfer fails before `size` bytes are in (lost
  // connection, body shorter than announced), since what came is then incomplete.
  int ReadData(char* buffer, int size);
  // Reads one body line without its line end (LF or CR LF), zero-terminated, at most
  // size - 1 characters: a longer line is cut and its rest is the next line. Returns the
  // number of characters stored; negative at the end of the body, on a failure or time-out
  // (a partial line stays for the next call), or when size < 2.
  int ReadToLineEnd(char* buffer, int size);

 private:
  std::unique_ptr<HttpPull> pull_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_HTTPCLIENT_H_
