// A TCP server on loopback that runs a session function for each accepted connection, each
// on its own thread. The HTTP server and the raw binary-protocol servers sit on it.
//
// Threads: one thread accepts; each session runs on its own thread, several at once. Stop()
// (and the destructor) wakes every session that sleeps in SleepFor() or waits in a read or a
// write, and joins all threads. Finished session threads are joined as new connections
// arrive, so a long-lived server does not accumulate them. A session's socket is closed
// when the session function returns.

#ifndef EVWATCH_SIM_NET_TCPSERVER_H_
#define EVWATCH_SIM_NET_TCPSERVER_H_

#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

namespace evsim {

struct TcpServerState;

// One accepted connection, used only by its session's thread.
class TcpConnection {
 public:
  TcpConnection(int fd, TcpServerState& state) : fd_(fd), state_(state) {}
  TcpConnection(const TcpConnection&) = delete;
  TcpConnection& operator=(const TcpConnection&) = delete;

  // Reads what has arrived, at most size bytes, waiting up to timeout for the first byte.
  // The count read; 0 when the peer closed (or the server stops); -1 on error or time-out.
  long Read(char* buffer, size_t size, std::chrono::milliseconds timeout);
  // Reads exactly n bytes within timeout (counted from the call). False on close, error,
  // time-out or stop; out then holds what was read.
  bool ReadExactly(size_t n, std::string& out, std::chrono::milliseconds timeout);
  // Writes all bytes (never raises SIGPIPE). False when the peer has gone or the server
  // is stopping.
  bool Write(std::string_view bytes);
  // Sleeps; false at once when the server stops.
  bool SleepFor(std::chrono::milliseconds duration);
  // Whether the peer has closed its side, checked without blocking.
  bool PeerClosed();
  bool Stopping() const;
  // Shuts the connection down in both directions; later reads and writes fail.
  void Close();

 private:
  const int fd_;  // owned by the server, valid until the session returns
  TcpServerState& state_;
};

class TcpServer {
 public:
  using Session = std::function<void(TcpConnection&)>;

  // Listens on host:port (port 0: a free port; "::1" or another IPv6 literal listens on
  // IPv6). Check Port() > 0 for success.
  explicit TcpServer(Session session, std::string host = "127.0.0.1", int port = 0);
  TcpServer(const TcpServer&) = delete;
  TcpServer& operator=(const TcpServer&) = delete;
  ~TcpServer();

  int Port() const;
  // Connections accepted so far.
  int Accepted() const;
  // Idempotent; after it returns no session runs.
  void Stop();

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace evsim

#endif  // EVWATCH_SIM_NET_TCPSERVER_H_
