#include "framework/host/eventbuf.h"

#include <algorithm>
#include <utility>

void EventBuf::SetStatus(bool state, int value) {
  StatusReport report{state, value, std::chrono::system_clock::now()};
  std::lock_guard<std::mutex> lock(mutex_);
  last_ = report;
  ++count_;
  for (auto& entry : observers_) entry.second(report);
}

int EventBuf::AddObserver(Observer observer) {
  std::lock_guard<std::mutex> lock(mutex_);
  int handle = next_handle_++;
  observers_.emplace_back(handle, std::move(observer));
  return handle;
}

void EventBuf::RemoveObserver(int handle) {
  std::lock_guard<std::mutex> lock(mutex_);
  observers_.erase(std::remove_if(observers_.begin(), observers_.end(),
                                  [handle](const auto& e) { return e.first == handle; }),
                   observers_.end());
}

StatusReport EventBuf::Last() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return last_;
}

uint64_t EventBuf::Count() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return count_;
}
