#include "tests/support/fakecamera.h"

#include <algorithm>
#include <atomic>
#include <utility>

#include "host/text/strutil.h"
#include "sim/net/tcpserver.h"

namespace evtest {

namespace {

void Play(const Reply& reply, evsim::HttpConnection& connection) {
  if (reply.delay.count() > 0 && !connection.SleepFor(reply.delay)) return;
  if (!connection.Write(reply.bytes)) return;
  if (reply.hold_open.count() > 0) connection.SleepFor(reply.hold_open);
}

}  // namespace

CameraAPIRecord ApiStreamAt(const std::string& path, int port) {
  CameraAPIRecord record;
  record.stream = StreamLocation{path, port};
  return record;
}

Reply Respond(int status, const std::string& content_type, const std::string& body,
              const std::vector<std::string>& extra_headers, bool chunked) {
  return Reply{evsim::MakeResponse(status, content_type, body, extra_headers, chunked)};
}

Reply Text(const std::string& body, const std::string& content_type) {
  return Respond(200, content_type, body);
}

Reply Binary(const std::string& body, const std::string& content_type) {
  return Respond(200, content_type, body);
}

Reply Raw(const std::string& bytes) { return Reply{bytes}; }

Reply HeadersThenSilence(const std::string& content_type, std::chrono::milliseconds silence) {
  Reply reply;
  reply.bytes = "HTTP/1.1 200 OK\r\nContent-Type: " + content_type + "\r\nConnection: close\r\n\r\n";
  reply.hold_open = silence;
  return reply;
}

MultipartWriter::MultipartWriter(evsim::HttpConnection& connection, std::string boundary)
    : connection_(connection), boundary_(std::move(boundary)) {}

bool MultipartWriter::Begin() {
  return connection_.Write("HTTP/1.1 200 OK\r\nContent-Type: multipart/x-mixed-replace;boundary=" +
                           boundary_ + "\r\nConnection: close\r\n\r\n");
}

bool MultipartWriter::Part(const std::string& content_type, const std::string& body,
                           bool with_length) {
  std::string part = "--" + boundary_ + "\r\nContent-Type: " + content_type + "\r\n";
  if (with_length) part += "Content-Length: " + std::to_string(body.size()) + "\r\n";
  part += "\r\n" + body + "\r\n";
  return connection_.Write(part);
}

bool MultipartWriter::Raw(const std::string& bytes) { return connection_.Write(bytes); }

std::string SeenRequest::Header(const std::string& name) const {
  for (const auto& [key, value] : headers) {
    if (EqualsNoCase(key, name)) return value;
  }
  return "";
}

struct FakeCamera::Script {
  std::vector<Reply> replies;  // empty when handler answers
  size_t next = 0;             // index of the next reply; the last one repeats
  Handler handler;
};

FakeCamera::FakeCamera(const std::string& host)
    : host_(host),
      server_(std::make_unique<evsim::HttpServer>(
          [this](evsim::HttpConnection& connection) { Serve(connection); }, host)) {}

FakeCamera::~FakeCamera() { server_->Stop(); }

int FakeCamera::Port() const { return server_->Port(); }

CameraRecord FakeCamera::Record(const std::string& user, const std::string& password) const {
  CameraRecord record;
  record.host = host_;
  record.port = Port();
  record.username = user;
  record.password = password;
  return record;
}

void FakeCamera::Answer(const std::string& target, Reply reply) {
  AnswerSequence(target, {std::move(reply)});
}

void FakeCamera::AnswerSequence(const std::string& target, std::vector<Reply> replies) {
  auto script = std::make_shared<Script>();
  script->replies = std::move(replies);
  std::lock_guard<std::mutex> lock(mutex_);
  scripts_[target] = std::move(script);
}

void FakeCamera::Handle(const std::string& target, Handler handler) {
  auto script = std::make_shared<Script>();
  script->handler = std::move(handler);
  std::lock_guard<std::mutex> lock(mutex_);
  scripts_[target] = std::move(script);
}

void FakeCamera::RequireAuth(evsim::AuthScheme scheme, const std::string& user,
                             const std::string& password) {
  std::lock_guard<std::mutex> lock(mutex_);
  auth_ = evsim::HttpAuth(scheme, user, password);
}

std::vector<SeenRequest> FakeCamera::Requests() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return log_;
}

std::vector<std::string> FakeCamera::Targets() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::vector<std::string> targets;
  targets.reserve(log_.size());
  for (const SeenRequest& r : log_) targets.push_back(r.target);
  return targets;
}

int FakeCamera::Count(const std::string& target) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return static_cast<int>(std::count_if(log_.begin(), log_.end(),
                                        [&target](const SeenRequest& r) { return r.target == target; }));
}

void FakeCamera::ClearLog() {
  std::lock_guard<std::mutex> lock(mutex_);
  log_.clear();
}

bool FakeCamera::WaitForRequests(size_t n, std::chrono::milliseconds deadline) const {
  std::unique_lock<std::mutex> lock(mutex_);
  return seen_cv_.wait_for(lock, deadline, [this, n] { return log_.size() >= n; });
}

void FakeCamera::Serve(evsim::HttpConnection& connection) {
  const evsim::HttpRequest& request = connection.Request();
  Handler handler;
  Reply reply;
  bool scripted = false;
  bool authorized = true;
  std::string challenge;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    log_.push_back(SeenRequest{request.method, request.target, request.headers});
    seen_cv_.notify_all();
    if (!auth_.Accepts(request)) {
      authorized = false;
      challenge = auth_.Challenge();
    } else {
      auto it = scripts_.find(request.target);
      if (it != scripts_.end()) {
        Script& script = *it->second;
        scripted = true;
        if (script.handler) {
          handler = script.handler;
        } else if (!script.replies.empty()) {
          reply = script.replies[std::min(script.next, script.replies.size() - 1)];
          ++script.next;
        }
      }
    }
  }
  if (!authorized) {
    connection.Write(challenge);
  } else if (handler) {
    handler(connection);
  } else if (scripted) {
    Play(reply, connection);
  } else {
    connection.Write(evsim::MakeResponse(404, "text/plain", "Not Found\n"));
  }
}

class RawSession : public RawConnection {
 public:
  using Log = std::function<void(std::string)>;
  RawSession(evsim::TcpConnection& tcp, Log log) : tcp_(tcp), log_(std::move(log)) {}

  bool ReadExactly(size_t n, std::string& out, std::chrono::milliseconds timeout) override {
    if (!tcp_.ReadExactly(n, out, timeout)) return false;
    log_(out);
    return true;
  }
  bool Write(const std::string& bytes) override { return tcp_.Write(bytes); }
  bool SleepFor(std::chrono::milliseconds duration) override { return tcp_.SleepFor(duration); }
  void Close() override { tcp_.Close(); }

 private:
  evsim::TcpConnection& tcp_;
  Log log_;
};

struct RawTcpServer::Impl {
  Impl(Script script, const std::string& host, int port)
      : server([this, s = std::move(script)](evsim::TcpConnection& tcp) {
          RawSession session(tcp, [this](std::string bytes) { Record(std::move(bytes)); });
          s(session);
        }, host, port) {}

  void Record(std::string bytes) {
    std::lock_guard<std::mutex> lock(mutex);
    received.push_back(std::move(bytes));
  }

  mutable std::mutex mutex;
  std::vector<std::string> received;  // guarded by mutex
  evsim::TcpServer server;            // last: stops before the log goes away
};

RawTcpServer::RawTcpServer(Script script, const std::string& host, int port)
    : impl_(std::make_unique<Impl>(std::move(script), host, port)) {}

RawTcpServer::~RawTcpServer() { impl_->server.Stop(); }

int RawTcpServer::Port() const { return impl_->server.Port(); }

int RawTcpServer::Connections() const { return impl_->server.Accepted(); }

std::vector<std::string> RawTcpServer::Received() const {
  std::lock_guard<std::mutex> lock(impl_->mutex);
  return impl_->received;
}

}  // namespace evtest
