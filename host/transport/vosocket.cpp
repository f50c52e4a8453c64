#include "framework/host/vosocket.h"

#include <errno.h>
#include <fcntl.h>
#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <climits>
#include <cstring>

#include "host/transport/linesplit.h"
#include "host/transport/transfernote.h"

namespace {

using Clock = std::chrono::steady_clock;

// Bytes asked of the kernel at once when a line is looked for.
constexpr size_t kLineChunk = 4096;

int MillisLeft(Clock::time_point deadline) {
  auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
  return static_cast<int>(std::clamp<long long>(left.count(), 0, INT_MAX));
}

// Waits for `events` on fd until deadline: 1 ready, 0 time-out, -1 error (errno set).
int PollUntil(int fd, short events, Clock::time_point deadline) {
  for (;;) {
    pollfd entry{fd, events, 0};
    int ready = poll(&entry, 1, MillisLeft(deadline));
    if (ready > 0) return 1;
    if (ready == 0) return 0;
    if (errno != EINTR) return -1;
  }
}

// Connects a non-blocking socket to one address within deadline; the descriptor or -1.
int ConnectOne(const addrinfo& address, Clock::time_point deadline) {
  int fd = socket(address.ai_family, address.ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC,
                  address.ai_protocol);
  if (fd < 0) return -1;
  if (connect(fd, address.ai_addr, address.ai_addrlen) == 0) return fd;
  if (errno == EINPROGRESS && PollUntil(fd, POLLOUT, deadline) == 1) {
    int error = 0;
    socklen_t length = sizeof(error);
    if (getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &length) == 0 && error == 0) return fd;
  }
  close(fd);
  return -1;
}

// One recv after a wait: the count, 0 on the peer's close, -1 on error or time-out (errno
// EAGAIN when nothing came in time).
long ReceiveSome(int fd, char* buffer, size_t size, int waited) {
  if (waited == 0) {
    errno = EAGAIN;
    return -1;
  }
  if (waited < 0) return -1;
  for (;;) {
    ssize_t n = recv(fd, buffer, size, 0);
    if (n >= 0) return n;
    if (errno == EINTR) continue;
    return -1;  // EAGAIN after a wakeup without data reads as "nothing in time"
  }
}

}  // namespace

VoSocket::VoSocket(std::string host, int port, int timeout, bool whole)
    : host_(std::move(host)), port_(port), timeout_(std::max(1, timeout)), whole_(whole),
      fd_(-1) {}

VoSocket::~VoSocket() { DisConnect(); }

int VoSocket::BuildConnect() {
  DisConnect();
  if (port_ <= 0 || port_ > 65535) return -1;
  std::string name = host_;
  if (name.size() > 2 && name.front() == '[' && name.back() == ']') {
    name = name.substr(1, name.size() - 2);
  }
  addrinfo hints{};
  hints.ai_family = AF_UNSPEC;
  hints.ai_socktype = SOCK_STREAM;
  hints.ai_flags = AI_NUMERICSERV;
  addrinfo* found = nullptr;
  if (getaddrinfo(name.c_str(), std::to_string(port_).c_str(), &hints, &found) != 0) {
    NoteTransfer(host_, port_, false, "cannot resolve the host name");
    return -1;
  }
  const Clock::time_point deadline = Clock::now() + std::chrono::seconds(timeout_);
  for (addrinfo* address = found; address != nullptr && fd_ < 0; address = address->ai_next) {
    fd_ = ConnectOne(*address, deadline);
  }
  freeaddrinfo(found);
  NoteTransfer(host_, port_, fd_ >= 0, "connection refused or host unreachable");
  return fd_ >= 0 ? 0 : -1;
}

void VoSocket::DisConnect() {
  if (fd_ >= 0) close(fd_);
  fd_ = -1;
  pending_.clear();
}

int VoSocket::WaitReadable() {
  if (fd_ < 0) {
    errno = ENOTCONN;
    return -1;
  }
  return PollUntil(fd_, POLLIN, Clock::now() + std::chrono::seconds(timeout_));
}

int VoSocket::ReadData(char* buffer, int size) {
  if (buffer == nullptr || size < 0) {
    errno = EINVAL;
    return -1;
  }
  if (size == 0) return 0;
  int count = static_cast<int>(std::min(pending_.size(), static_cast<size_t>(size)));
  std::memcpy(buffer, pending_.data(), count);
  pending_.erase(0, count);
  if (count > 0 && !whole_) return count;
  while (count < size) {
    long n = ReceiveSome(fd_, buffer + count, size - count, WaitReadable());
    if (n > 0) {
      count += static_cast<int>(n);
      if (!whole_) break;
    } else if (n == 0) {
      break;  // orderly close: what came before it, or 0
    } else if (errno == EAGAIN && count > 0) {
      break;  // a wait for more timed out: what has come so far
    } else {
      return -1;
    }
  }
  return count;
}

int VoSocket::ReadToLineEnd(char* buffer, int size) {
  if (buffer == nullptr || size < 2) {
    errno = EINVAL;
    return -1;
  }
  const size_t limit = static_cast<size_t>(size) - 1;
  bool closed = false;
  for (;;) {
    LineSplit split = SplitLine(pending_.data(), pending_.size(), limit, closed);
    if (split.found) {
      std::memcpy(buffer, pending_.data(), split.stored);
      buffer[split.stored] = '\0';
      pending_.erase(0, split.consumed);
      return static_cast<int>(split.stored);
    }
    if (closed) return -1;
    char chunk[kLineChunk];
    long n = ReceiveSome(fd_, chunk, sizeof(chunk), WaitReadable());
    if (n < 0) return -1;  // a partial line stays pending for the next call
    if (n == 0) closed = true;
    pending_.append(chunk, static_cast<size_t>(n));
  }
}

int VoSocket::WriteData(char* buffer, int size) {
  if (buffer == nullptr || size < 0 || fd_ < 0) {
    errno = fd_ < 0 ? ENOTCONN : EINVAL;
    return -1;
  }
  const Clock::time_point deadline = Clock::now() + std::chrono::seconds(timeout_);
  int sent = 0;
  while (sent < size) {
    ssize_t n = send(fd_, buffer + sent, size - sent, MSG_NOSIGNAL);
    if (n > 0) {
      sent += static_cast<int>(n);
      continue;
    }
    if (n < 0 && errno == EINTR) continue;
    if (n < 0 && (errno == EAGAIN || errno == EWOULDBLOCK)) {
      int ready = PollUntil(fd_, POLLOUT, deadline);
      if (ready == 1) continue;
      if (ready == 0) errno = EAGAIN;
      return -1;
    }
    return -1;
  }
  return size;
}
