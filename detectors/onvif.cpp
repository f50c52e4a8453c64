#include "detectors/onvif.h"

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "framework/host/eventbuf.h"

namespace {

// The longest wait before subscribing again after a failure.
constexpr int kMaxBackoffMillis = 30000;

}  // namespace

bool OnvifDetector::TopicStates::Active(int index) const {
  if (index < 1 || index > static_cast<int>(order.size())) return false;
  return state.at(order[static_cast<size_t>(index - 1)]);
}

OnvifDetector::OnvifDetector(Camera* camera, int input) : camera_(camera), input_(input) {
  source_ = camera ? std::max(1, std::atoi(camera->GetCH().c_str())) : 1;
  if (camera) {
    settings_.host = camera->GetHost();
    settings_.port = camera->GetPort();
    settings_.user = camera->GetUsername();
    settings_.password = camera->GetPassword();
  }
  Reconnect();
}

OnvifDetector::~OnvifDetector() {
  StopIfStarted();
  client_->Unsubscribe();
}

void OnvifDetector::Reconnect() { client_ = std::make_unique<OnvifEventClient>(settings_); }

void OnvifDetector::SetEventPath(const std::string& path) {
  settings_.event_path = path;
  Reconnect();
}

void OnvifDetector::SetPullTimeout(int seconds) {
  settings_.pull_timeout = seconds;
  Reconnect();
}

void OnvifDetector::SetMessageLimit(int messages) {
  settings_.message_limit = messages;
  Reconnect();
}

void OnvifDetector::SetTermination(int seconds) {
  settings_.termination = seconds;
  Reconnect();
}

int OnvifDetector::Start() {
  client_->ClearInterrupt();
  return DetectorBase::Start();
}

int OnvifDetector::Stop() {
  // Ends a long poll or a back-off now instead of after its time-out.
  client_->Interrupt();
  return DetectorBase::Stop();
}

int OnvifDetector::Read(bool& state) {
  state = false;
  if (!camera_ || client_->Interrupted()) return -1;
  if (!client_->Subscribed()) {
    cell_ = TopicStates();
    alarm_ = TopicStates();
    inputs_ = TopicStates();
    if (client_->Subscribe() != 0) return -1;
  }
  std::vector<OnvifEvent> events;
  if (client_->Pull(events) != 0) return -1;
  for (const OnvifEvent& event : events) {
    TopicStates& topic = event.topic == OnvifEvent::Topic::kCellMotion    ? cell_
                         : event.topic == OnvifEvent::Topic::kMotionAlarm ? alarm_
                                                                          : inputs_;
    if (topic.state.find(event.source) == topic.state.end()) topic.order.push_back(event.source);
    topic.state[event.source] = event.state;
  }
  state = input_ == 0 ? (cell_.Active(source_) || alarm_.Active(source_)) : inputs_.Active(input_);
  return 0;
}

int OnvifDetector::EventDetecor() {
  int backoff = std::max(1, Interval());
  while (IsStarted() == 1) {
    bool state = false;
    if (Read(state) == 0) {
      event_buffer_->SetStatus(state, input_ == 0 ? (state ? 100 : 0) : 1);
      backoff = std::max(1, Interval());
      continue;
    }
    event_buffer_->SetStatus(false, 0);
    client_->WaitInterruptible(backoff);
    backoff = std::min(kMaxBackoffMillis, backoff * 2);
  }
  client_->Unsubscribe();
  event_buffer_->SetStatus(false, 0);
  return 0;
}

OnvifMD::OnvifMD(Camera* camera) : OnvifDetector(camera, 0) {}

OnvifMD::~OnvifMD() { StopIfStarted(); }

int OnvifMD::DoMD(bool& motion, unsigned int& level) {
  int result = Read(motion);
  level = result == 0 && motion ? 100 : 0;
  if (result != 0) motion = false;
  return result;
}

OnvifEID::OnvifEID(Camera* camera, int input) : OnvifDetector(camera, input < 1 ? -1 : input) {}

OnvifEID::~OnvifEID() { StopIfStarted(); }

int OnvifEID::DoEID(bool& active) {
  int result = Read(active);
  if (result != 0) active = false;
  return result;
}
