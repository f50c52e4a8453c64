// A small HTTP/1.1 server on loopback for camera emulations and fake cameras.
//
// One thread accepts; each connection gets a thread that reads a request and passes it to
// the handler, which writes the answer itself (a whole response, raw bytes, or a stream of
// parts over time). After the handler returns the connection is closed, so every request
// comes on its own connection (clients retrying with credentials reconnect). A client has
// 10 s to send its request head (at most 64 KiB); a Content-Length body (at most 1 MiB) is
// read before the handler runs (SOAP services answer from it); a malformed request gets 400 without it.
//
// Threads: handlers run on connection threads, several at once. Stop() (and the destructor)
// wakes every handler that waits in SleepFor(), closes the connections and joins all threads.

#ifndef EVWATCH_SIM_NET_HTTPSERVER_H_
#define EVWATCH_SIM_NET_HTTPSERVER_H_

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace evsim {

struct HttpRequest {
  std::string method;
  std::string target;   // path with query, as sent ("/a/b.cgi?x=1")
  std::string version;  // "HTTP/1.1"
  std::vector<std::pair<std::string, std::string>> headers;  // in order, as sent
  std::string body;     // the Content-Length body; empty when none

  // The first header of that name (case-insensitive); empty when absent.
  std::string Header(std::string_view name) const;
  // target without its query.
  std::string Path() const;
};

// Parses a request head (request line and header lines, up to its blank line; LF or CR LF)
// into request. False when the request line is malformed. RTSP requests have the same shape.
bool ParseRequestHead(std::string_view head, HttpRequest& request);

class HttpConnection {
 public:
  virtual ~HttpConnection() = default;
  virtual const HttpRequest& Request() const = 0;
  // Writes all bytes. False when the peer has gone or the server is stopping.
  virtual bool Write(std::string_view bytes) = 0;
  // Sleeps; false at once when the server stops (handlers then return).
  virtual bool SleepFor(std::chrono::milliseconds duration) = 0;
  // Whether the peer has closed its side (checked without blocking).
  virtual bool PeerClosed() = 0;
  virtual bool Stopping() const = 0;
};

using HttpHandler = std::function<void(HttpConnection&)>;

class HttpServer {
 public:
  // Listens on host:port (port 0: a free port). Check Port() > 0 for success.
  explicit HttpServer(HttpHandler handler, std::string host = "127.0.0.1", int port = 0);
  HttpServer(const HttpServer&) = delete;
  HttpServer& operator=(const HttpServer&) = delete;
  ~HttpServer();

  int Port() const;
  void Stop();

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

// A whole response: status line, Content-Type (when not empty), Content-Length (or chunked
// transfer encoding), extra header lines (each "Name: value"), "Connection: close", body.
std::string MakeResponse(int status, std::string_view content_type, std::string_view body,
                         const std::vector<std::string>& extra_headers = {},
                         bool chunked = false);

// The reason phrase of a status code ("OK", "Not Found", ...).
const char* ReasonPhrase(int status);

}  // namespace evsim

#endif  // EVWATCH_SIM_NET_HTTPSERVER_H_
