// Fake RTSP camera for the RTP reader and detector tests: a loopback TCP server that runs the
// simulator's RTSP session on each connection, with the stream that the test scripts for
// that connection, and which logs every RTSP request it saw.
//
//   evtest::FakeRtspCamera cam([](int connection) {
//     evsim::RtspStream s;
//     s.extension = [](uint64_t n) { return std::optional<std::string>("abcd"); };
//     return s;
//   });
//   RtpFetch fetch("127.0.0.1", cam.Port(), "/live.sdp", "", "", "client");
//
// Threads: the script runs on the server's session threads; log queries come from the test
// thread.

#ifndef EVWATCH_TESTS_SUPPORT_FAKERTSPCAMERA_H_
#define EVWATCH_TESTS_SUPPORT_FAKERTSPCAMERA_H_

#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "sim/net/httpserver.h"
#include "sim/net/rtspserver.h"
#include "sim/net/tcpserver.h"

namespace evtest {

class FakeRtspCamera {
 public:
  // script(n) gives the stream of the n-th connection (from 0); its on_request is replaced
  // by the camera's log.
  explicit FakeRtspCamera(std::function<evsim::RtspStream(int connection)> script);
  ~FakeRtspCamera();
  FakeRtspCamera(const FakeRtspCamera&) = delete;
  FakeRtspCamera& operator=(const FakeRtspCamera&) = delete;

  int Port() const;
  int Connections() const;
  // Every request seen so far, in order of arrival.
  std::vector<evsim::HttpRequest> Requests() const;
  // Their methods, in order.
  std::vector<std::string> Methods() const;
  int Count(const std::string& method) const;
  // Waits until at least n requests of that method have been seen.
  bool WaitForMethod(const std::string& method, int n = 1,
                     std::chrono::milliseconds deadline = std::chrono::seconds(20)) const;

 private:
  std::function<evsim::RtspStream(int)> script_;
  mutable std::mutex mutex_;
  mutable std::condition_variable cv_;
  std::vector<evsim::HttpRequest> log_;  // guarded by mutex_
  int connections_ = 0;                  // guarded by mutex_
  std::unique_ptr<evsim::TcpServer> server_;
};

}  // namespace evtest

#endif  // EVWATCH_TESTS_SUPPORT_FAKERTSPCAMERA_H_
