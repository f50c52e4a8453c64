#include "host/transport/httppull.h"

#include <algorithm>
#include <chrono>
#include <climits>
#include <cstring>

#include "host/text/strutil.h"
#include "host/transport/headerlines.h"
#include "host/transport/transfernote.h"

namespace {

// A failed transfer's cause, in words.
std::string FailureCause(CURLcode result) {
  switch (result) {
    case CURLE_COULDNT_RESOLVE_HOST: return "cannot resolve the host name";
    case CURLE_COULDNT_CONNECT: return "connection refused or host unreachable";
    case CURLE_OPERATION_TIMEDOUT: return "no answer in time";
    case CURLE_GOT_NOTHING: return "the camera closed the connection without an answer";
    case CURLE_RECV_ERROR:
    case CURLE_SEND_ERROR: return "the connection was lost";
    default: return curl_easy_strerror(result);
  }
}

// A camera that sends header lines without end must not grow our header map without end.
constexpr size_t kMaxHeaderBytes = 256 * 1024;
// Consumed bytes are dropped from the front of the buffer once they are this many and at
// least half of it, so that each byte moves at most a few times.
constexpr size_t kCompactAfter = 16 * 1024;

// "HTTP/1.1 200 OK" -> 200; 0 when the line holds no three-digit code.
int ParseStatus(std::string_view line) {
  size_t space = line.find(' ');
  if (space == std::string_view::npos) return 0;
  std::string_view code = TrimBlanks(line.substr(space + 1)).substr(0, 3);
  if (code.size() != 3) return 0;
  int status = 0;
  for (char c : code) {
    if (c < '0' || c > '9') return 0;
    status = status * 10 + (c - '0');
  }
  return status;
}

bool BuildUrl(CURLU* url, const HttpPull::Target& target) {
  if (target.host.empty() || target.port <= 0 || target.port > 65535) return false;
  std::string path = target.path;
  std::string query;
  bool has_query = false;
  size_t mark = path.find('?');
  if (mark != std::string::npos) {
    query = path.substr(mark + 1);
    path.erase(mark);
    has_query = true;
  }
  if (path.empty() || path.front() != '/') path.insert(0, "/");
  // Parts are set without CURLU_URLENCODE: the camera gets path and query as given.
  return curl_url_set(url, CURLUPART_SCHEME, "http", 0) == CURLUE_OK &&
         curl_url_set(url, CURLUPART_HOST, UrlHost(target.host).c_str(), 0) == CURLUE_OK &&
         curl_url_set(url, CURLUPART_PORT, std::to_string(target.port).c_str(), 0) ==
             CURLUE_OK &&
         curl_url_set(url, CURLUPART_PATH, path.c_str(), 0) == CURLUE_OK &&
         (!has_query || query.empty() ||
          curl_url_set(url, CURLUPART_QUERY, query.c_str(), 0) == CURLUE_OK);
}

}  // namespace

// curl_global_init is not safe to race with other curl calls; a function-local static runs
// it once, before the first transfer of any thread.
bool CurlReady() {
  static const bool ready = curl_global_init(CURL_GLOBAL_DEFAULT) == CURLE_OK;
  return ready;
}

std::string UrlHost(const std::string& host) {
  if (host.empty() || host.front() == '[' || host.find(':') == std::string::npos) return host;
  std::string bracketed = "[";
  for (size_t i = 0; i < host.size(); ++i) {
    bracketed += host[i];
    if (host[i] == '%' && host.compare(i + 1, 2, "25") != 0) bracketed += "25";
  }
  return bracketed + "]";
}

HttpPull::HttpPull(Target target) : target_(std::move(target)) {}

HttpPull::~HttpPull() {
  if (multi_ != nullptr && easy_ != nullptr) curl_multi_remove_handle(multi_, easy_);
  if (easy_ != nullptr) curl_easy_cleanup(easy_);
  if (multi_ != nullptr) curl_multi_cleanup(multi_);
  if (url_ != nullptr) curl_url_cleanup(url_);
}

bool HttpPull::Configure() {
  const long timeout = std::max(1, target_.timeout);
  bool ok = BuildUrl(url_, target_) &&
            curl_easy_setopt(easy_, CURLOPT_CURLU, url_) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_PROTOCOLS_STR, "http") == CURLE_OK &&
            // Signals would be unsafe in a multi-threaded host.
            curl_easy_setopt(easy_, CURLOPT_NOSIGNAL, 1L) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_CONNECTTIMEOUT, timeout) == CURLE_OK &&
            // Cameras are reached directly, whatever proxy the environment names.
            curl_easy_setopt(easy_, CURLOPT_PROXY, "") == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_PATH_AS_IS, 1L) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_HTTP_VERSION, CURL_HTTP_VERSION_1_1) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_WRITEFUNCTION, &HttpPull::BodyThunk) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_WRITEDATA, this) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_HEADERFUNCTION, &HttpPull::HeaderThunk) ==
                CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_HEADERDATA, this) == CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_PREREQFUNCTION, &HttpPull::PrereqThunk) ==
                CURLE_OK &&
            curl_easy_setopt(easy_, CURLOPT_PREREQDATA, this) == CURLE_OK;
  if (ok && !target_.user.empty()) {
    // Separate options, never the URL: credentials may hold ':' '@' '%' or any byte.
    ok = curl_easy_setopt(easy_, CURLOPT_USERNAME, target_.user.c_str()) == CURLE_OK &&
         curl_easy_setopt(easy_, CURLOPT_PASSWORD, target_.password.c_str()) == CURLE_OK &&
         curl_easy_setopt(easy_, CURLOPT_HTTPAUTH, CURLAUTH_BASIC | CURLAUTH_DIGEST) ==
             CURLE_OK;
  }
  return ok;
}

bool HttpPull::Start(bool head_only) {
  if (started_) return false;
  started_ = true;
  if (!CurlReady()) return false;
  multi_ = curl_multi_init();
  easy_ = curl_easy_init();
  url_ = curl_url();
  if (multi_ == nullptr || easy_ == nullptr || url_ == nullptr || !Configure()) {
    done_ = true;
    result_ = CURLE_FAILED_INIT;
    return false;
  }
  if (head_only) curl_easy_setopt(easy_, CURLOPT_NOBODY, 1L);
  if (curl_multi_add_handle(multi_, easy_) != CURLM_OK) {
    done_ = true;
    result_ = CURLE_FAILED_INIT;
    return false;
  }
  Pump([this] { return headers_in_; });
  NoteOutcome();
  return headers_in_;
}

void HttpPull::NoteOutcome() const {
  if (headers_in_) {
    const bool ok = status_ >= 200 && status_ < 300;
    NoteTransfer(target_.host, target_.port, ok, ok ? "" : HttpStatusCause(status_));
  } else if (done_) {
    NoteTransfer(target_.host, target_.port, false, FailureCause(result_));
  } else {
    NoteTransfer(target_.host, target_.port, false,
                 "no answer within " + std::to_string(std::max(1, target_.timeout)) + " s");
  }
}

int HttpPull::Status() const { return headers_in_ ? status_ : 0; }

bool HttpPull::Header(std::string_view name, std::string* value) const {
  if (!headers_in_) return false;
  for (const auto& [key, text] : headers_) {
    if (EqualsNoCase(key, name)) {
      *value = text;
      return true;
    }
  }
  return false;
}

void HttpPull::Consume(size_t n) {
  head_ += std::min(n, Buffered());
  if (head_ == buffer_.size()) {
    buffer_.clear();
    head_ = 0;
  } else if (head_ >= kCompactAfter && head_ * 2 >= buffer_.size()) {
    buffer_.erase(0, head_);
    head_ = 0;
  }
}

HttpPull::Wait HttpPull::Fill(size_t want) {
  if (easy_ == nullptr || !headers_in_) return Wait::kFailed;
  want_ = want;
  Wait result = Pump([this, want] { return Buffered() >= want; });
  want_ = 0;
  return result;
}

template <typename Done>
HttpPull::Wait HttpPull::Pump(Done done) {
  using Clock = std::chrono::steady_clock;
  const auto patience = std::chrono::seconds(std::max(1, target_.timeout));
  auto deadline = Clock::now() + patience;
  for (;;) {
    if (done()) return Wait::kReady;
    if (done_) return result_ == CURLE_OK ? Wait::kEnded : Wait::kFailed;
    Resume();
    Perform();
    auto now = Clock::now();
    if (progress_) {
      progress_ = false;
      deadline = now + patience;
    }
    if (done() || done_) continue;
    if (now >= deadline) return Wait::kTimedOut;
    auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - now).count();
    int wait_ms = static_cast<int>(std::min<long long>(left + 1, INT_MAX));
    curl_multi_poll(multi_, nullptr, 0, wait_ms, nullptr);
  }
}

void HttpPull::Perform() {
  int running = 0;
  curl_multi_perform(multi_, &running);
  int left = 0;
  while (CURLMsg* message = curl_multi_info_read(multi_, &left)) {
    if (message->msg != CURLMSG_DONE) continue;
    done_ = true;
    result_ = message->data.result;
    // A finished transfer leaves nothing to answer: its last response is the final one.
    if (block_ended_ && status_ >= 200) headers_in_ = true;
  }
}

void HttpPull::Resume() {
  if (!paused_ || Buffered() >= std::max(kBufferBound, want_)) return;
  paused_ = false;  // before the call: libcurl may deliver (and pause again) inside it
  curl_easy_pause(easy_, CURLPAUSE_CONT);
}

size_t HttpPull::OnBody(const char* data, size_t size) {
  // libcurl passes on only the body of a response it will not answer with a new request.
  if (block_ended_) headers_in_ = true;
  if (Buffered() >= std::max(kBufferBound, want_)) {
    paused_ = true;
    return CURL_WRITEFUNC_PAUSE;
  }
  try {
    buffer_.append(data, size);
  } catch (...) {
    return 0;  // fails the transfer
  }
  progress_ = true;
  return size;
}

size_t HttpPull::OnHeader(const char* data, size_t size) {
  progress_ = true;
  header_bytes_ += size;
  if (header_bytes_ > kMaxHeaderBytes) return 0;
  if (headers_in_) return size;  // trailers of a chunked body
  const std::string_view line = HeaderLineText(data, size);
  try {
    if (line.substr(0, 5) == "HTTP/") {
      status_ = ParseStatus(line);
      headers_.clear();
      block_ended_ = false;
    } else if (line.empty()) {
      // 1xx blocks are followed by the real response. A 401 that we hold credentials for
      // may still be answered by libcurl: the body callback or the transfer's end decides.
      if (status_ >= 200) {
        block_ended_ = true;
        if (status_ != 401 || target_.user.empty()) headers_in_ = true;
      }
    } else {
      AddHeaderLine(line, &headers_);
    }
  } catch (...) {
    return 0;
  }
  return size;
}

size_t HttpPull::BodyThunk(char* data, size_t size, size_t count, void* self) {
  return static_cast<HttpPull*>(self)->OnBody(data, size * count);
}

size_t HttpPull::HeaderThunk(char* data, size_t size, size_t count, void* self) {
  return static_cast<HttpPull*>(self)->OnHeader(data, size * count);
}

int HttpPull::PrereqThunk(void* self, char*, char*, int, int) {
  // A connection counts as news: the wait for the answer starts over once it is made.
  static_cast<HttpPull*>(self)->progress_ = true;
  return CURL_PREREQFUNC_OK;
}

