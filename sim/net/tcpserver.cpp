#include "sim/net/tcpserver.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <list>
#include <mutex>
#include <system_error>
#include <thread>

namespace evsim {

namespace {

using Clock = std::chrono::steady_clock;

// A peer that takes no data for this long is treated as gone, so a write cannot block a
// session (and Stop) on a stuck client for ever.
constexpr int kSendTimeoutSeconds = 30;
// What is left unread when a session ends is discarded up to this much, so that closing
// does not reset the connection under an answer the client has not read yet.
constexpr size_t kDrainLimit = 64 * 1024;

int MillisLeft(Clock::time_point deadline) {
  auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
  return static_cast<int>(std::clamp<long long>(left.count(), 0, 1 << 30));
}

// Waits for fd to become readable; false on time-out or error.
bool WaitReadable(int fd, Clock::time_point deadline) {
  for (;;) {
    pollfd p{fd, POLLIN, 0};
    int r = poll(&p, 1, MillisLeft(deadline));
    if (r > 0) return true;
    if (r == 0) {
      errno = EAGAIN;
      return false;
    }
    if (errno != EINTR) return false;
  }
}

int OpenListener(const std::string& host, int port) {
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_flags = AI_PASSIVE | AI_NUMERICSERV;
  addrinfo* found = nullptr;
  std::string service = std::to_string(port);
  if (getaddrinfo(host.c_str(), service.c_str(), &hints, &found) != 0) return -1;
  int fd = -1;
  for (addrinfo* a = found; a != nullptr; a = a->ai_next) {
    fd = socket(a->ai_family, a->ai_socktype | SOCK_CLOEXEC, a->ai_protocol);
    if (fd < 0) continue;
    int one = 1;
    setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &one, sizeof(one));
    if (a->ai_family == AF_INET6) setsockopt(fd, IPPROTO_IPV6, IPV6_V6ONLY, &one, sizeof(one));
    if (bind(fd, a->ai_addr, a->ai_addrlen) == 0 && listen(fd, SOMAXCONN) == 0) break;
    close(fd);
    fd = -1;
  }
  freeaddrinfo(found);
  return fd;
}

int BoundPort(int fd) {
  sockaddr_storage addr{};
  socklen_t len = sizeof(addr);
  if (getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &len) != 0) return 0;
  if (addr.ss_family == AF_INET) return ntohs(reinterpret_cast<sockaddr_in*>(&addr)->sin_port);
  if (addr.ss_family == AF_INET6) return ntohs(reinterpret_cast<sockaddr_in6*>(&addr)->sin6_port);
  return 0;
}

void PrepareAccepted(int fd) {
  int one = 1;
  // Small answers and pushed parts go out at once instead of waiting on delayed ACKs.
  setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &one, sizeof(one));
  timeval send_timeout{kSendTimeoutSeconds, 0};
  setsockopt(fd, SOL_SOCKET, SO_SNDTIMEO, &send_timeout, sizeof(send_timeout));
}

// Sends our FIN and discards what the client already sent; the caller then closes.
void FinishConnection(int fd) {
  shutdown(fd, SHUT_WR);
  char scrap[4096];
  size_t drained = 0;
  while (drained < kDrainLimit) {
    ssize_t n = recv(fd, scrap, sizeof(scrap), MSG_DONTWAIT);
    if (n <= 0) break;
    drained += static_cast<size_t>(n);
  }
}

}  // namespace

struct TcpServerState {
  std::mutex mutex;
  std::condition_variable wake;
  std::atomic<bool> stopping{false};  // set once by Stop; never cleared
};

long TcpConnection::Read(char* buffer, size_t size, std::chrono::milliseconds timeout) {
  if (size == 0) return 0;
  if (!WaitReadable(fd_, Clock::now() + timeout)) return -1;
  for (;;) {
    ssize_t n = recv(fd_, buffer, size, 0);
    if (n >= 0) return static_cast<long>(n);
    if (errno != EINTR) return -1;
  }
}

bool TcpConnection::ReadExactly(size_t n, std::string& out, std::chrono::milliseconds timeout) {
  out.clear();
  auto deadline = Clock::now() + timeout;
  char chunk[4096];
  while (out.size() < n) {
    auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
    if (left.count() < 0) return false;
    long got = Read(chunk, std::min(sizeof(chunk), n - out.size()), left);
    if (got <= 0) return false;
    out.append(chunk, static_cast<size_t>(got));
  }
  return true;
}

bool TcpConnection::Write(std::string_view bytes) {
  while (!bytes.empty()) {
    if (Stopping()) return false;
    ssize_t n = send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    bytes.remove_prefix(static_cast<size_t>(n));
  }
  return true;
}

bool TcpConnection::SleepFor(std::chrono::milliseconds duration) {
  std::unique_lock<std::mutex> lock(state_.mutex);
  return !state_.wake.wait_for(lock, duration, [this] { return state_.stopping.load(); });
}

bool TcpConnection::PeerClosed() {
  pollfd p{fd_, POLLIN | POLLRDHUP, 0};
  int r = poll(&p, 1, 0);
  if (r < 0) return errno != EINTR;
  if (r == 0) return false;
  if (p.revents & (POLLHUP | POLLERR | POLLRDHUP | POLLNVAL)) return true;
  char probe;
  ssize_t n = recv(fd_, &probe, 1, MSG_PEEK | MSG_DONTWAIT);
  if (n == 0) return true;
  if (n > 0) return false;
  return errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR;
}

bool TcpConnection::Stopping() const { return state_.stopping.load(); }

void TcpConnection::Close() { shutdown(fd_, SHUT_RDWR); }

struct TcpServer::Impl {
  struct Worker {
    explicit Worker(int socket) : fd(socket) {}
    int fd;             // -1 once the session has closed it; guarded by workers_mutex
    bool done = false;  // guarded by workers_mutex
    std::thread thread;
  };

  Impl(TcpServer::Session s, const std::string& host, int requested_port)
      : session(std::move(s)) {
    listen_fd = OpenListener(host, requested_port);
    if (listen_fd < 0) return;
    port = BoundPort(listen_fd);
    if (port <= 0) {
      close(listen_fd);
      listen_fd = -1;
      return;
    }
    acceptor = std::thread([this] { AcceptLoop(); });
  }

  void AcceptLoop() {
    for (;;) {
      int fd = accept4(listen_fd, nullptr, nullptr, SOCK_CLOEXEC);
      if (state.stopping.load()) {
        if (fd >= 0) close(fd);
        return;
      }
      if (fd < 0) {
        if (errno == EINTR || errno == ECONNABORTED) continue;
        // Out of descriptors or memory: back off instead of spinning.
        std::unique_lock<std::mutex> lock(state.mutex);
        state.wake.wait_for(lock, std::chrono::milliseconds(10),
                            [this] { return state.stopping.load(); });
        continue;
      }
      accepted.fetch_add(1);
      ReapFinished();
      PrepareAccepted(fd);
      StartSession(fd);
    }
  }

  void StartSession(int fd) {
    std::lock_guard<std::mutex> lock(workers_mutex);
    workers.push_back(std::make_unique<Worker>(fd));
    Worker* w = workers.back().get();
    try {
      w->thread = std::thread([this, w] { RunSession(w); });
    } catch (const std::system_error&) {
      close(fd);
      workers.pop_back();
    }
  }

  void RunSession(Worker* w) {
    {
      TcpConnection connection(w->fd, state);
      try {
        session(connection);
      } catch (...) {
        // A throwing session only loses its own connection.
      }
    }
    FinishConnection(w->fd);
    std::lock_guard<std::mutex> lock(workers_mutex);
    close(w->fd);  // under the lock: Stop must never shut down a reused descriptor number
    w->fd = -1;
    w->done = true;
  }

  void ReapFinished() {
    std::list<std::unique_ptr<Worker>> finished;
    {
      std::lock_guard<std::mutex> lock(workers_mutex);
      for (auto it = workers.begin(); it != workers.end();) {
        auto next = std::next(it);
        if ((*it)->done) finished.splice(finished.end(), workers, it);
        it = next;
      }
    }
    for (auto& w : finished) w->thread.join();
  }

  void Stop() {
    std::lock_guard<std::mutex> stop_lock(stop_mutex);
    {
      std::lock_guard<std::mutex> lock(state.mutex);
      if (state.stopping.load()) return;
      state.stopping.store(true);
    }
    state.wake.notify_all();
    if (listen_fd >= 0) shutdown(listen_fd, SHUT_RDWR);  // wakes accept()
    if (acceptor.joinable()) acceptor.join();
    if (listen_fd >= 0) close(listen_fd);
    std::list<std::unique_ptr<Worker>> all;
    {
      std::lock_guard<std::mutex> lock(workers_mutex);
      for (auto& w : workers) {
        if (w->fd >= 0) shutdown(w->fd, SHUT_RDWR);
      }
      all.swap(workers);
    }
    for (auto& w : all) w->thread.join();
  }

  TcpServer::Session session;
  TcpServerState state;
  int listen_fd = -1;  // closed by Stop
  int port = 0;        // 0 when listening failed
  std::atomic<int> accepted{0};
  std::thread acceptor;
  std::mutex stop_mutex;  // held through Stop, so every caller returns after the joins
  std::mutex workers_mutex;
  std::list<std::unique_ptr<Worker>> workers;  // guarded by workers_mutex
};

TcpServer::TcpServer(Session session, std::string host, int port)
    : impl_(std::make_unique<Impl>(std::move(session), host, port)) {}

TcpServer::~TcpServer() { Stop(); }

int TcpServer::Port() const { return impl_->port; }

int TcpServer::Accepted() const { return impl_->accepted.load(); }

void TcpServer::Stop() { impl_->Stop(); }

}  // namespace evsim
