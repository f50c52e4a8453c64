#include "framework/host/rtpfetch.h"

#include <curl/curl.h>
#include <sys/socket.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <deque>
#include <string_view>
#include <utility>

#include "host/text/strutil.h"
#include "host/transport/headerlines.h"
#include "host/transport/httppull.h"

namespace {

using Clock = std::chrono::steady_clock;

// A camera that names no session timeout keeps a session for 60 s (the protocol's default).
constexpr int kDefaultSessionTimeout = 60;
// Longest session description and header block taken from a camera.
constexpr size_t kMaxBody = 64 * 1024;
constexpr size_t kMaxHeaders = 64 * 1024;
// TEARDOWN is a courtesy: a camera that does not answer it soon is not waited for.
constexpr long kTeardownTimeout = 2;
constexpr size_t kRtpHeader = 12;

// The interleaved channels we ask for; the camera's SETUP answer may name others.
constexpr char kTransport[] = "RTP/AVP/TCP;unicast;interleaved=0-1";

// One received RTP packet, parsed.
struct Packet {
  std::string bytes;
  size_t ext_at = 0;      // extension data (after its four-byte header)
  size_t ext_length = 0;  // 0: none
  size_t payload_at = 0;
  size_t payload_end = 0;
};

// Fills the offsets of an RTP version 2 packet; false for anything else or for lengths that
// do not fit the packet.
bool ParseRtp(Packet* packet) {
  const std::string& b = packet->bytes;
  const size_t size = b.size();
  if (size < kRtpHeader) return false;
  const unsigned char first = static_cast<unsigned char>(b[0]);
  if ((first >> 6) != 2) return false;
  size_t at = kRtpHeader + 4 * (first & 0x0f);  // after the CSRC list
  if (at > size) return false;
  packet->ext_at = at;
  packet->ext_length = 0;
  if (first & 0x10) {
    if (at + 4 > size) return false;
    const size_t words = (static_cast<unsigned char>(b[at + 2]) << 8) |
                         static_cast<unsigned char>(b[at + 3]);
    packet->ext_at = at + 4;
    packet->ext_length = words * 4;
    at = packet->ext_at + packet->ext_length;
    if (at > size) return false;
  }
  size_t end = size;
  if (first & 0x20) {
    const size_t padding = static_cast<unsigned char>(b[size - 1]);
    if (padding == 0 || padding > size - at) return false;
    end = size - padding;
  }
  packet->payload_at = at;
  packet->payload_end = end;
  return true;
}

// "name=a-b" parameters of a Transport header: the first channel, or -1.
int InterleavedChannel(std::string_view transport) {
  size_t at = transport.find("interleaved=");
  if (at == std::string_view::npos) return -1;
  at += std::strlen("interleaved=");
  int channel = 0;
  bool digits = false;
  while (at < transport.size() && transport[at] >= '0' && transport[at] <= '9') {
    channel = channel * 10 + (transport[at] - '0');
    digits = true;
    if (channel > 255) return -1;
    ++at;
  }
  return digits ? channel : -1;
}

// The "timeout=N" parameter of a Session header, or the default.
int SessionTimeout(std::string_view session) {
  size_t at = session.find("timeout=");
  if (at == std::string_view::npos) return kDefaultSessionTimeout;
  at += std::strlen("timeout=");
  long seconds = 0;
  bool digits = false;
  while (at < session.size() && session[at] >= '0' && session[at] <= '9' && seconds < 86400) {
    seconds = seconds * 10 + (session[at] - '0');
    digits = true;
    ++at;
  }
  return digits && seconds > 0 ? static_cast<int>(seconds) : kDefaultSessionTimeout;
}

// A control attribute resolved against the presentation's base URL.
std::string ResolveControl(const std::string& base, std::string_view control) {
  if (control.empty() || control == "*") return base;
  if (StartsNoCase(control, "rtsp://") || StartsNoCase(control, "rtsps://")) {
    return std::string(control);
  }
  std::string url = base;
  if (url.empty() || url.back() != '/') url += '/';
  if (control.front() == '/') control.remove_prefix(1);
  return url + std::string(control);
}

// The session-level and first video track's control attributes of a session description.
struct Description {
  bool has_video = false;
  std::string session_control;
  std::string video_control;
};

Description ParseSdp(std::string_view sdp) {
  Description d;
  enum class Section { kSession, kVideo, kOther } section = Section::kSession;
  while (!sdp.empty()) {
    size_t end = sdp.find('\n');
    std::string_view line = TrimBlanks(sdp.substr(0, end));
    sdp.remove_prefix(end == std::string_view::npos ? sdp.size() : end + 1);
    if (line.substr(0, 2) == "m=") {
      // Only the first video track is ours; later ones are passed over like any other.
      section = !d.has_video && line.substr(2, 6) == "video " ? Section::kVideo : Section::kOther;
      if (section == Section::kVideo) d.has_video = true;
      continue;
    }
    if (line.substr(0, 10) != "a=control:") continue;
    std::string_view control = TrimBlanks(line.substr(10));
    if (section == Section::kSession) d.session_control = std::string(control);
    if (section == Section::kVideo) d.video_control = std::string(control);
  }
  return d;
}

}  // namespace

// The RTSP session behind RtpFetch: one libcurl easy handle on the calling thread, its
// interleaved packets queued by the interleave callback as libcurl reads them.
class RtspSession {
 public:
  RtspSession(std::string host, int port, std::string path, std::string user,
              std::string password, std::string client, int timeout);
  RtspSession(const RtspSession&) = delete;
  RtspSession& operator=(const RtspSession&) = delete;
  ~RtspSession();

  int Next(unsigned int* ext_length, int* payload_length);
  int CopyExt(unsigned char* buffer, unsigned int length);
  int CopyPayload(char* buffer, int length);
  void Drop() { current_valid_ = false; }

 private:
  bool SetUp();
  bool Request(long request, const std::string& uri, long timeout);
  bool Receive();
  bool KeepAliveIfDue();
  int Fail();
  std::string Header(std::string_view name) const;

  size_t OnInterleaved(const char* data, size_t size);
  size_t OnBody(const char* data, size_t size);
  size_t OnHeader(const char* data, size_t size);
  static size_t InterleaveThunk(void* data, size_t size, size_t count, void* self);
  static size_t BodyThunk(char* data, size_t size, size_t count, void* self);
  static size_t HeaderThunk(char* data, size_t size, size_t count, void* self);
  static curl_socket_t OpenSocketThunk(void* self, curlsocktype purpose, curl_sockaddr* address);

  const std::string host_;
  const int port_;
  const std::string path_;
  const std::string user_;
  const std::string password_;
  const std::string client_;
  const long timeout_;  // seconds
  CURL* easy_ = nullptr;
  bool opened_ = false;     // the set-up was attempted
  bool failed_ = false;     // the session is over; every call fails
  bool playing_ = false;    // PLAY was answered: TEARDOWN is owed
  bool bound_ = false;      // SETUP was answered: the session lives on this connection
  std::string url_;         // the presentation's URL
  std::string aggregate_;   // where PLAY, GET_PARAMETER and TEARDOWN go
  int channel_ = 0;         // interleaved channel of our track's RTP packets
  int keepalive_seconds_ = kDefaultSessionTimeout / 2;
  bool options_keepalive_ = false;  // the camera refused GET_PARAMETER
  long last_status_ = 0;            // of the last request's answer; 0: none came
  Clock::time_point last_request_;
  std::deque<std::string> queue_;  // received RTP packets of our channel, oldest first
  Packet current_;
  bool current_valid_ = false;
  size_t payload_read_ = 0;  // bytes of the current payload handed out
  std::string body_;         // body of the last response
  std::vector<std::pair<std::string, std::string>> headers_;  // of the last response
  size_t header_bytes_ = 0;
};

RtspSession::RtspSession(std::string host, int port, std::string path, std::string user,
                         std::string password, std::string client, int timeout)
    : host_(std::move(host)),
      port_(port),
      path_(std::move(path)),
      user_(std::move(user)),
      password_(std::move(password)),
      client_(std::move(client)),
      timeout_(std::max(1, timeout)) {}

RtspSession::~RtspSession() {
  if (easy_ == nullptr) return;
  if (playing_ && !failed_) Request(CURL_RTSPREQ_TEARDOWN, aggregate_, kTeardownTimeout);
  curl_easy_cleanup(easy_);
}

int RtspSession::Fail() {
  failed_ = true;
  current_valid_ = false;
  queue_.clear();
  return -1;
}

std::string RtspSession::Header(std::string_view name) const {
  for (const auto& [key, value] : headers_) {
    if (EqualsNoCase(key, name)) return value;
  }
  return "";
}

bool RtspSession::SetUp() {
  opened_ = true;
  if (host_.empty() || port_ <= 0 || port_ > 65535 || !CurlReady()) return false;
  if (StartsNoCase(path_, "rtsp://")) {
    url_ = path_;
  } else {
    url_ = "rtsp://" + UrlHost(host_) + ":" + std::to_string(port_) +
           (path_.empty() || path_.front() != '/' ? "/" : "") + path_;
  }
  easy_ = curl_easy_init();
  if (easy_ == nullptr) return false;
  bool ok = curl_easy_setopt(easy_, CURLOPT_URL, url_.c_str()) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_PROTOCOLS_STR, "rtsp") == CURLE_OK &&
            // Signals would be unsafe in a multi-threaded host.
            curl_easy_setopt(easy_, CURLOPT_NOSIGNAL, 1L) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_CONNECTTIMEOUT, timeout_) == CURLE_OK &&
            // Cameras are reached directly, whatever proxy the environment names.
            curl_easy_setopt(easy_, CURLOPT_PROXY, "") == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_USERAGENT, client_.c_str()) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_INTERLEAVEFUNCTION, &RtspSession::InterleaveThunk) ==
                CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_INTERLEAVEDATA, this) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_WRITEFUNCTION, &RtspSession::BodyThunk) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_WRITEDATA, this) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_HEADERFUNCTION, &RtspSession::HeaderThunk) ==
                CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_HEADERDATA, this) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_OPENSOCKETFUNCTION, &RtspSession::OpenSocketThunk) ==
                CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_OPENSOCKETDATA, this) == CURLE_OK;
  if (ok && !user_.empty()) {
    // Separate options, never the URL: credentials may hold ':' '@' '%' or any byte.
    ok = curl_easy_setopt(easy_, CURLOPT_USERNAME, user_.c_str()) == CURLE_OK &&
         curl_easy_setopt(easy_, CURLOPT_PASSWORD, password_.c_str()) == CURLE_OK &&
         curl_easy_setopt(easy_, CURLOPT_HTTPAUTH, CURLAUTH_BASIC | CURLAUTH_DIGEST) == CURLE_OK;
  }
  if (!ok || !Request(CURL_RTSPREQ_OPTIONS, url_, timeout_) ||
      !Request(CURL_RTSPREQ_DESCRIBE, url_, timeout_)) {
    return false;
  }
  const Description description = ParseSdp(body_);
  if (!description.has_video) return false;
  std::string base = Header("Content-Base");
  if (base.empty()) base = Header("Content-Location");
  if (base.empty()) base = url_;
  aggregate_ = ResolveControl(base, description.session_control);
  const std::string track = ResolveControl(base, description.video_control);

  if (curl_easy_setopt(easy_, CURLOPT_RTSP_TRANSPORT, kTransport) != CURLE_OK ||
      !Request(CURL_RTSPREQ_SETUP, track, timeout_)) {
    return false;
  }
  bound_ = true;
  const int channel = InterleavedChannel(Header("Transport"));
  if (channel >= 0) channel_ = channel;
  // Half the camera's session timeout leaves room for a slow answer.
  keepalive_seconds_ = std::max(1, SessionTimeout(Header("Session")) / 2);
  if (curl_easy_setopt(easy_, CURLOPT_RANGE, "npt=0.000-") != CURLE_OK ||
      !Request(CURL_RTSPREQ_PLAY, aggregate_, timeout_)) {
    return false;
  }
  curl_easy_setopt(easy_, CURLOPT_RANGE, nullptr);
  playing_ = true;
  return true;
}

// One request and its answer; true for a 2xx. A challenge that libcurl could not answer in
// the same call is answered by one more call, now that libcurl has seen it.
bool RtspSession::Request(long request, const std::string& uri, long timeout) {
  for (int attempt = 0; attempt < 2; ++attempt) {
    body_.clear();
    headers_.clear();
    header_bytes_ = 0;
    if (curl_easy_setopt(easy_, CURLOPT_RTSP_REQUEST, request) != CURLE_OK ||
        curl_easy_setopt(easy_, CURLOPT_RTSP_STREAM_URI, uri.c_str()) != CURLE_OK ||
        curl_easy_setopt(easy_, CURLOPT_TIMEOUT_MS, timeout * 1000) != CURLE_OK) {
      return false;
    }
    last_request_ = Clock::now();
    last_status_ = 0;
    if (curl_easy_perform(easy_) != CURLE_OK) return false;
    long status = 0;
    curl_easy_getinfo(easy_, CURLINFO_RESPONSE_CODE, &status);
    last_status_ = status;
    if (status >= 200 && status <= 299) return true;
    if (status != 401 || user_.empty()) return false;
  }
  return false;
}

// Reads what the camera sends until at least one packet of ours is queued; false when the
// connection fails or nothing comes within the time-out.
bool RtspSession::Receive() {
  const Clock::time_point deadline = Clock::now() + std::chrono::seconds(timeout_);
  while (queue_.empty()) {
    if (!KeepAliveIfDue()) return false;
    if (!queue_.empty()) break;  // packets that came with the keep-alive's answer
    const Clock::time_point now = Clock::now();
    if (now >= deadline) return false;
    const long left = static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - now).count());
    if (curl_easy_setopt(easy_, CURLOPT_RTSP_REQUEST, static_cast<long>(CURL_RTSPREQ_RECEIVE)) !=
            CURLE_OK ||
        curl_easy_setopt(easy_, CURLOPT_TIMEOUT_MS, std::max(1L, left)) != CURLE_OK ||
        curl_easy_perform(easy_) != CURLE_OK) {
      return false;
    }
  }
  return true;
}

bool RtspSession::KeepAliveIfDue() {
  if (Clock::now() - last_request_ < std::chrono::seconds(keepalive_seconds_)) return true;
  if (!options_keepalive_) {
    if (Request(CURL_RTSPREQ_GET_PARAMETER, aggregate_, timeout_)) return true;
    if (last_status_ == 0) return false;  // no answer: the connection is gone
    // A camera without GET_PARAMETER counts any request in the session; OPTIONS it knows.
    options_keepalive_ = true;
  }
  return Request(CURL_RTSPREQ_OPTIONS, aggregate_, timeout_);
}

int RtspSession::Next(unsigned int* ext_length, int* payload_length) {
  current_valid_ = false;
  if (failed_) return -1;
  if (!opened_ && !SetUp()) return Fail();
  for (;;) {
    // Due also while packets are queued: a reader that falls behind keeps its session.
    if (!KeepAliveIfDue()) return Fail();
    if (queue_.empty() && !Receive()) return Fail();
    current_.bytes = std::move(queue_.front());
    queue_.pop_front();
    if (!ParseRtp(&current_)) continue;  // not RTP: nothing for the caller
    current_valid_ = true;
    payload_read_ = 0;
    if (ext_length != nullptr) *ext_length = static_cast<unsigned int>(current_.ext_length);
    if (payload_length != nullptr) {
      *payload_length = static_cast<int>(current_.payload_end - current_.payload_at);
    }
    return 0;
  }
}

int RtspSession::CopyExt(unsigned char* buffer, unsigned int length) {
  if (!current_valid_ || buffer == nullptr || length == 0 || length > current_.ext_length) {
    return -1;
  }
  std::memcpy(buffer, current_.bytes.data() + current_.ext_at, length);
  return 0;
}

int RtspSession::CopyPayload(char* buffer, int length) {
  if (!current_valid_ || length < 0 || (length > 0 && buffer == nullptr)) return -1;
  const size_t left = current_.payload_end - current_.payload_at - payload_read_;
  if (static_cast<size_t>(length) > left) return -1;
  std::memcpy(buffer, current_.bytes.data() + current_.payload_at + payload_read_,
              static_cast<size_t>(length));
  payload_read_ += static_cast<size_t>(length);
  return 0;
}

size_t RtspSession::OnInterleaved(const char* data, size_t size) {
  // "$", channel, 16-bit length, packet.
  if (size < 4 || static_cast<unsigned char>(data[1]) != channel_) return size;
  try {
    if (queue_.size() >= static_cast<size_t>(RtpFetch::kMaxQueued)) queue_.pop_front();
    queue_.emplace_back(data + 4, size - 4);
  } catch (...) {
    return 0;  // fails the transfer
  }
  return size;
}

size_t RtspSession::OnBody(const char* data, size_t size) {
  if (body_.size() + size > kMaxBody) return 0;
  try {
    body_.append(data, size);
  } catch (...) {
    return 0;
  }
  return size;
}

size_t RtspSession::OnHeader(const char* data, size_t size) {
  header_bytes_ += size;
  if (header_bytes_ > kMaxHeaders) return 0;
  const std::string_view line = HeaderLineText(data, size);
  try {
    if (line.substr(0, 5) == "RTSP/") {
      headers_.clear();  // a new response (after a challenge) replaces the last one's
      return size;
    }
    AddHeaderLine(line, &headers_);
  } catch (...) {
    return 0;
  }
  return size;
}

size_t RtspSession::InterleaveThunk(void* data, size_t size, size_t count, void* self) {
  return static_cast<RtspSession*>(self)->OnInterleaved(static_cast<const char*>(data),
                                                        size * count);
}

size_t RtspSession::BodyThunk(char* data, size_t size, size_t count, void* self) {
  return static_cast<RtspSession*>(self)->OnBody(data, size * count);
}

size_t RtspSession::HeaderThunk(char* data, size_t size, size_t count, void* self) {
  return static_cast<RtspSession*>(self)->OnHeader(data, size * count);
}

curl_socket_t RtspSession::OpenSocketThunk(void* self, curlsocktype, curl_sockaddr* address) {
  // Once SETUP is answered the session and its interleaved channels belong to this
  // connection: libcurl must not quietly retry on a new one, where no packet would ever come.
  if (static_cast<RtspSession*>(self)->bound_) return CURL_SOCKET_BAD;
  return socket(address->family, address->socktype, address->protocol);
}

RtpFetch::RtpFetch(std::string host, int port, std::string path, std::string user,
                   std::string password, std::string clientName)
    : RtpFetch(std::move(host), port, std::move(path), std::move(user), std::move(password),
               std::move(clientName), kDefaultTimeout) {}

RtpFetch::RtpFetch(std::string host, int port, std::string path, std::string user,
                   std::string password, std::string clientName, int timeout)
    : session_(std::make_unique<RtspSession>(std::move(host), port, std::move(path),
                                             std::move(user), std::move(password),
                                             std::move(clientName), timeout)) {}

RtpFetch::~RtpFetch() = default;

int RtpFetch::NextHdrInfo(unsigned int& extLength) { return session_->Next(&extLength, nullptr); }

int RtpFetch::FetchExtData(unsigned char* buffer, unsigned int length) {
  return session_->CopyExt(buffer, length);
}

int RtpFetch::ReadPartHeader(int* length, char* header, int headerSize) {
  if (length == nullptr || header == nullptr || headerSize < 1) return -1;
  if (session_->Next(nullptr, length) != 0) return -1;
  header[0] = '\0';
  return 0;
}

int RtpFetch::ReadPartBody(char* buffer, int length) {
  return session_->CopyPayload(buffer, length);
}

int RtpFetch::SkipContent(char*, int) {
  session_->Drop();
  return 0;
}
