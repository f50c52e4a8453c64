#include "tests/support/loopbackclient.h"

#include <arpa/inet.h>
#include <dirent.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <openssl/evp.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

namespace evtest {

namespace {

using Clock = std::chrono::steady_clock;

size_t CountEntries(const char* dir_path) {
  DIR* dir = opendir(dir_path);
  if (dir == nullptr) return 0;
  size_t count = 0;
  while (dirent* entry = readdir(dir)) {
    if (entry->d_name[0] != '.') ++count;
  }
  closedir(dir);
  return count;
}

}  // namespace

LoopbackClient::LoopbackClient(int port, bool ipv6) {
  int fd = socket(ipv6 ? AF_INET6 : AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (fd < 0) return;
  int r;
  if (ipv6) {
    sockaddr_in6 addr{};
    addr.sin6_family = AF_INET6;
    addr.sin6_port = htons(static_cast<uint16_t>(port));
    addr.sin6_addr = in6addr_loopback;
    r = connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr));
  } else {
    sockaddr_in addr{};
    addr.sin_family = AF_INET;
    addr.sin_port = htons(static_cast<uint16_t>(port));
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    r = connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr));
  }
  if (r != 0) {
    close(fd);
    return;
  }
  fd_ = fd;
}

LoopbackClient::~LoopbackClient() { Close(); }

void LoopbackClient::Close() {
  if (fd_ >= 0) close(fd_);
  fd_ = -1;
}

bool LoopbackClient::Send(const std::string& bytes) {
  size_t sent = 0;
  while (fd_ >= 0 && sent < bytes.size()) {
    ssize_t n = send(fd_, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return false;
    sent += static_cast<size_t>(n);
  }
  return fd_ >= 0;
}

int LoopbackClient::ReadSome(Clock::time_point deadline) {
  if (fd_ < 0) return -1;
  for (;;) {
    auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
    pollfd p{fd_, POLLIN, 0};
    int r = poll(&p, 1, static_cast<int>(std::max<long long>(left.count(), 0)));
    if (r < 0 && errno == EINTR) continue;
    if (r <= 0) return -1;
    char chunk[4096];
    ssize_t n = recv(fd_, chunk, sizeof(chunk), 0);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return errno == ECONNRESET ? 0 : -1;
    if (n == 0) return 0;
    pending_.append(chunk, static_cast<size_t>(n));
    return 1;
  }
}

std::string LoopbackClient::ReadAll(std::chrono::milliseconds timeout) {
  auto deadline = Clock::now() + timeout;
  while (ReadSome(deadline) > 0) {
  }
  std::string out;
  out.swap(pending_);
  return out;
}

std::string LoopbackClient::ReadUntil(const std::string& marker, std::chrono::milliseconds timeout) {
  auto deadline = Clock::now() + timeout;
  while (pending_.find(marker) == std::string::npos && ReadSome(deadline) > 0) {
  }
  std::string out;
  out.swap(pending_);
  return out;
}

bool LoopbackClient::WaitClosed(std::chrono::milliseconds timeout) {
  auto deadline = Clock::now() + timeout;
  int r;
  while ((r = ReadSome(deadline)) > 0) pending_.clear();
  return r == 0;
}

std::string Exchange(int port, const std::string& request) {
  LoopbackClient client(port);
  if (!client.Connected() || !client.Send(request)) return "";
  return client.ReadAll();
}

std::string GetRequest(const std::string& target, const std::string& extra_headers) {
  return "GET " + target + " HTTP/1.1\r\nHost: 127.0.0.1\r\n" + extra_headers + "\r\n";
}

std::string BasicAuthorization(const std::string& user, const std::string& password) {
  std::string plain = user + ":" + password;
  std::string encoded(4 * ((plain.size() + 2) / 3) + 1, '\0');
  int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&encoded[0]),
                          reinterpret_cast<const unsigned char*>(plain.data()),
                          static_cast<int>(plain.size()));
  encoded.resize(static_cast<size_t>(std::max(n, 0)));
  return "Authorization: Basic " + encoded + "\r\n";
}

std::string Md5Hex(const std::string& text) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int size = 0;
  EVP_Digest(text.data(), text.size(), digest, &size, EVP_md5(), nullptr);
  std::string hex;
  char byte[3];
  for (unsigned int i = 0; i < size; ++i) {
    std::snprintf(byte, sizeof(byte), "%02x", digest[i]);
    hex += byte;
  }
  return hex;
}

std::string DigestAuthorization(const std::string& challenge_response, const std::string& method,
                                const std::string& uri, const std::string& user,
                                const std::string& password, bool with_qop) {
  auto quoted = [&challenge_response](const std::string& name) {
    size_t at = challenge_response.find(name + "=\"");
    if (at == std::string::npos) return std::string();
    at += name.size() + 2;
    return challenge_response.substr(at, challenge_response.find('"', at) - at);
  };
  const std::string realm = quoted("realm");
  const std::string nonce = quoted("nonce");
  const std::string ha1 = Md5Hex(user + ":" + realm + ":" + password);
  const std::string ha2 = Md5Hex(method + ":" + uri);
  std::string header = "Authorization: Digest username=\"" + user + "\", realm=\"" + realm +
                       "\", nonce=\"" + nonce + "\", uri=\"" + uri + "\", ";
  if (with_qop) {
    const std::string cnonce = "0a4f113b";
    const std::string response =
        Md5Hex(ha1 + ":" + nonce + ":00000001:" + cnonce + ":auth:" + ha2);
    header += "response=\"" + response + "\", qop=auth, nc=00000001, cnonce=\"" + cnonce +
              "\", algorithm=MD5";
  } else {
    header += "response=\"" + Md5Hex(ha1 + ":" + nonce + ":" + ha2) + "\"";
  }
  return header + "\r\n";
}

size_t OpenDescriptorCount() { return CountEntries("/proc/self/fd"); }

size_t ThreadCount() { return CountEntries("/proc/self/task"); }

}  // namespace evtest
