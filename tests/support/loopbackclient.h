// A minimal blocking TCP client on loopback for the toolkit's own tests: it sends bytes as
// they stand and reads back what arrives, so the tests see exactly what a server wrote.
//
// Threads: a LoopbackClient is used by one thread at a time; separate clients are independent.

#ifndef EVWATCH_TESTS_SUPPORT_LOOPBACKCLIENT_H_
#define EVWATCH_TESTS_SUPPORT_LOOPBACKCLIENT_H_

#include <chrono>
#include <cstddef>
#include <string>

namespace evtest {

class LoopbackClient {
 public:
  // Connects to 127.0.0.1:port (or "::1" when ipv6). Check Connected().
  explicit LoopbackClient(int port, bool ipv6 = false);
  ~LoopbackClient();  // closes the connection
  LoopbackClient(const LoopbackClient&) = delete;
  LoopbackClient& operator=(const LoopbackClient&) = delete;

  bool Connected() const { return fd_ >= 0; }
  bool Send(const std::string& bytes);
  // Reads until the peer closes; what arrived before the time-out when it does not.
  std::string ReadAll(std::chrono::milliseconds timeout = std::chrono::seconds(10));
  // Reads until the received text holds marker (or the peer closes, or the time-out
  // passes); returns everything read so far, including any bytes after the marker.
  std::string ReadUntil(const std::string& marker,
                        std::chrono::milliseconds timeout = std::chrono::seconds(10));
  // Whether the peer closed within timeout (data arriving meanwhile is discarded).
  bool WaitClosed(std::chrono::milliseconds timeout = std::chrono::seconds(10));
  void Close();

 private:
  // One wait and read into pending_: 1 when bytes arrived, 0 when the peer closed, -1 on
  // error or time-out.
  int ReadSome(std::chrono::steady_clock::time_point deadline);

  int fd_ = -1;          // -1 when not connected
  std::string pending_;  // read but not yet returned
};

// Sends a request on a new connection and returns the whole answer (until the peer closes).
std::string Exchange(int port, const std::string& request);

// A GET request for target; extra_headers are whole lines, each ending in CR LF.
std::string GetRequest(const std::string& target, const std::string& extra_headers = "");

// The Authorization header line (with its CR LF) a client sends for Basic credentials.
std::string BasicAuthorization(const std::string& user, const std::string& password);
// The Authorization header line (with its CR LF) that answers the Digest challenge in a 401
// response, computed here with MD5 as RFC 7616 says (qop=auth, nc 00000001), or in the
// RFC 2069 form without qop when with_qop is false.
std::string DigestAuthorization(const std::string& challenge_response, const std::string& method,
                                const std::string& uri, const std::string& user,
                                const std::string& password, bool with_qop = true);
// The hex MD5 digest of text.
std::string Md5Hex(const std::string& text);

// The number of open descriptors and of threads of this process.
size_t OpenDescriptorCount();
size_t ThreadCount();

}  // namespace evtest

#endif  // EVWATCH_TESTS_SUPPORT_LOOPBACKCLIENT_H_
