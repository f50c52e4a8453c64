#include "tests/support/fakertspcamera.h"

#include <algorithm>

namespace evtest {

FakeRtspCamera::FakeRtspCamera(std::function<evsim::RtspStream(int connection)> script)
    : script_(std::move(script)) {
  server_ = std::make_unique<evsim::TcpServer>([this](evsim::TcpConnection& connection) {
    int n;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      n = connections_++;
    }
    evsim::RtspStream stream = script_(n);
    stream.on_request = [this](const evsim::HttpRequest& request) {
      std::lock_guard<std::mutex> lock(mutex_);
      log_.push_back(request);
      cv_.notify_all();
    };
    evsim::ServeRtspSession(connection, stream);
  });
}

FakeRtspCamera::~FakeRtspCamera() { server_->Stop(); }

int FakeRtspCamera::Port() const { return server_->Port(); }

int FakeRtspCamera::Connections() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return connections_;
}

std::vector<evsim::HttpRequest> FakeRtspCamera::Requests() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return log_;
}

std::vector<std::string> FakeRtspCamera::Methods() const {
  std::vector<std::string> methods;
  for (const evsim::HttpRequest& r : Requests()) methods.push_back(r.method);
  return methods;
}

int FakeRtspCamera::Count(const std::string& method) const {
  std::vector<std::string> methods = Methods();
  return static_cast<int>(std::count(methods.begin(), methods.end(), method));
}

bool FakeRtspCamera::WaitForMethod(const std::string& method, int n,
                                   std::chrono::milliseconds deadline) const {
  std::unique_lock<std::mutex> lock(mutex_);
  return cv_.wait_for(lock, deadline, [&] {
    return std::count_if(log_.begin(), log_.end(), [&](const evsim::HttpRequest& r) {
             return r.method == method;
           }) >= n;
  });
}

}  // namespace evtest
