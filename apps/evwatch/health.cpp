#include "apps/evwatch/health.h"

#include <set>

namespace evwatch {

namespace {

std::string Address(const std::string& host, int port) { return host + ":" + std::to_string(port); }

}  // namespace

CameraHealth::CameraHealth(const Config& config, std::ostream& log, Clock now)
    : now_(now ? std::move(now) : [] { return std::chrono::steady_clock::now(); }), log_(log) {
  std::lock_guard<std::mutex> lock(mutex_);
  Build(config);
}

void CameraHealth::Update(const Config& config) {
  std::lock_guard<std::mutex> lock(mutex_);
  Build(config);
}

void CameraHealth::Build(const Config& config) {
  std::vector<State> before;
  before.swap(cameras_);
  by_address_.clear();
  for (const CameraConfig& c : config.cameras) {
    State state;
    for (const State& old : before) {
      if (old.name == c.name) state = old;
    }
    state.name = c.name;
    state.address = Address(c.record.host, c.record.port);
    state.detectors.clear();
    for (const DetectorConfig& d : c.detectors) {
      state.detectors += (state.detectors.empty() ? "" : ", ") + d.name;
    }
    const size_t index = cameras_.size();
    cameras_.push_back(state);
    std::set<int> ports = {c.record.port};
    if (c.api.stream) ports.insert(c.api.stream->port);
    for (const auto& [key, location] : c.api.streams) ports.insert(location.port);
    if (c.frames) ports.insert(c.frames->port);
    for (int port : ports) by_address_.emplace(Address(c.record.host, port), index);
  }
}

void CameraHealth::OnTransfer(const TransferOutcome& outcome) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto [from, to] = by_address_.equal_range(Address(outcome.host, outcome.port));
  for (auto it = from; it != to; ++it) {
    State& s = cameras_[it->second];
    if (outcome.ok) {
      if (s.failing && s.said_failing) {
        log_ << "evwatch: camera " << s.name << " (" << s.address << ") answers again" << std::endl;
        s.said_failing = false;
      }
      s.failing = false;
      continue;
    }
    s.failing = true;
    s.cause = outcome.cause;
    const auto now = now_();
    if (s.said_failing && s.said_cause == s.cause) continue;  // already said, no answer since
    if (s.said_cause == s.cause && now - s.said_at < kQuietTime) continue;  // flapping
    log_ << "evwatch: camera " << s.name << " (" << s.address << ") is failing: " << s.cause
         << " (detectors: " << s.detectors << ")" << std::endl;
    s.said_failing = true;
    s.said_cause = s.cause;
    s.said_at = now;
  }
}

bool CameraHealth::Failing(const std::string& camera) const {
  std::lock_guard<std::mutex> lock(mutex_);
  for (const State& s : cameras_) {
    if (s.name == camera) return s.failing;
  }
  return false;
}

}  // namespace evwatch
