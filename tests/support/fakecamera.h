// Fake camera for detector and client tests: an HTTP server on loopback whose answers the
// test scripts byte for byte per request target, and which logs every request it saw.
//
//   evtest::FakeCamera cam;
//   cam.Answer("/axis-cgi/io/input.cgi?checkactive=1", evtest::Text("input1=active\r\n"));
//   ... run the detector against 127.0.0.1:cam.Port() ...
//   EXPECT_EQ(cam.Targets(), (std::vector<std::string>{"/axis-cgi/io/input.cgi?checkactive=1"}));
//
// A target is matched exactly (path with query); an unscripted target gets 404. With
// authentication set, a request without valid credentials gets the 401 challenge (logged
// like any other request).
//
// Threads: scripting calls and log queries may come from the test thread while requests are
// served; answers are served on the server's connection threads.

#ifndef EVWATCH_TESTS_SUPPORT_FAKECAMERA_H_
#define EVWATCH_TESTS_SUPPORT_FAKECAMERA_H_

#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"

namespace evtest {

// One scripted answer.
struct Reply {
  std::string bytes;                       // written as they stand
  std::chrono::milliseconds delay{0};      // wait before writing
  std::chrono::milliseconds hold_open{0};  // keep the connection open after writing
};

// A whole response with Content-Length (or chunked).
// A camera API whose default stream is at `path` on `port`, for detectors that ask their
// API where the camera's stream is.
CameraAPIRecord ApiStreamAt(const std::string& path, int port);

Reply Respond(int status, const std::string& content_type, const std::string& body,
              const std::vector<std::string>& extra_headers = {}, bool chunked = false);
// 200 with Content-Type text/plain (or the type given).
Reply Text(const std::string& body, const std::string& content_type = "text/plain");
// 200 with a binary body.
Reply Binary(const std::string& body,
             const std::string& content_type = "application/octet-stream");
// Raw bytes, for malformed answers.
Reply Raw(const std::string& bytes);
// Headers of a 200 response without a body and a connection that then stays silent for
// `silence` (or until the server stops).
Reply HeadersThenSilence(const std::string& content_type, std::chrono::milliseconds silence);

// Writer of a multipart/x-mixed-replace stream for handlers that push parts over time.
class MultipartWriter {
 public:
  // REQUIRES: connection outlives the writer.
  explicit MultipartWriter(evsim::HttpConnection& connection, std::string boundary = "myboundary");
  // Writes the response head (200, Content-Type multipart/x-mixed-replace;boundary=...).
  bool Begin();
  // Writes one part: boundary line, Content-Type, Content-Length (when with_length),
  // blank line, body, CR LF.
  bool Part(const std::string& content_type, const std::string& body, bool with_length = true);
  // Writes bytes as they stand (for malformed streams).
  bool Raw(const std::string& bytes);
  const std::string& Boundary() const { return boundary_; }

 private:
  evsim::HttpConnection& connection_;
  std::string boundary_;
};

struct SeenRequest {
  std::string method;
  std::string target;
  std::vector<std::pair<std::string, std::string>> headers;
  std::string Header(const std::string& name) const;  // case-insensitive, "" when absent
};

class FakeCamera {
 public:
  using Handler = std::function<void(evsim::HttpConnection&)>;

  // Listens on a free port of `host` (a loopback address).
  explicit FakeCamera(const std::string& host = "127.0.0.1");
  ~FakeCamera();
  FakeCamera(const FakeCamera&) = delete;
  FakeCamera& operator=(const FakeCamera&) = delete;

  int Port() const;
  // A camera record pointing at this camera.
  CameraRecord Record(const std::string& user = "", const std::string& password = "") const;

  // The same answer to every request for target.
  void Answer(const std::string& target, Reply reply);
  // One answer per request, in order; the last one repeats.
  void AnswerSequence(const std::string& target, std::vector<Reply> replies);
  // A handler that writes the answer itself (pushes, slow or silent answers).
  void Handle(const std::string& target, Handler handler);
  // Require credentials of this scheme on every request.
  void RequireAuth(evsim::AuthScheme scheme, const std::string& user, const std::string& password);

  // The requests seen so far, in order of arrival.
  std::vector<SeenRequest> Requests() const;
  std::vector<std::string> Targets() const;
  int Count(const std::string& target) const;
  void ClearLog();
  // Waits until at least n requests have been seen; false when the deadline passes first.
  bool WaitForRequests(size_t n, std::chrono::milliseconds deadline = std::chrono::seconds(10)) const;

 private:
  struct Script;
  void Serve(evsim::HttpConnection& connection);

  mutable std::mutex mutex_;
  mutable std::condition_variable seen_cv_;
  std::map<std::string, std::shared_ptr<Script>> scripts_;  // guarded by mutex_
  std::vector<SeenRequest> log_;                            // guarded by mutex_
  evsim::HttpAuth auth_;                                    // guarded by mutex_
  const std::string host_;
  std::unique_ptr<evsim::HttpServer> server_;
};

// A raw TCP server on loopback that runs a scripted exchange with each connection, for
// binary protocols.
class RawConnection {
 public:
  virtual ~RawConnection() = default;
  // Reads exactly n bytes; false on close, error or time-out.
  virtual bool ReadExactly(size_t n, std::string& out,
                           std::chrono::milliseconds timeout = std::chrono::seconds(5)) = 0;
  virtual bool Write(const std::string& bytes) = 0;
  // Sleeps; false at once when the server stops.
  virtual bool SleepFor(std::chrono::milliseconds duration) = 0;
  virtual void Close() = 0;
};

class RawTcpServer {
 public:
  using Script = std::function<void(RawConnection&)>;
  // Runs script once per accepted connection, each on its own thread. Listens on
  // host:port (port 0: a free port); Port() is 0 when that cannot be bound.
  explicit RawTcpServer(Script script, const std::string& host = "127.0.0.1", int port = 0);
  ~RawTcpServer();
  RawTcpServer(const RawTcpServer&) = delete;
  RawTcpServer& operator=(const RawTcpServer&) = delete;

  int Port() const;
  int Connections() const;  // accepted so far
  // Everything the scripts have read so far: one entry per completed ReadExactly, in order
  // of completion (so in order per connection).
  std::vector<std::string> Received() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace evtest

#endif  // EVWATCH_TESTS_SUPPORT_FAKECAMERA_H_
