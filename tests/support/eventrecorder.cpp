#include "tests/support/eventrecorder.h"

#include <algorithm>
#include <ostream>

namespace evtest {

EventRecorder::EventRecorder(EventBuf& buffer) : buffer_(buffer) {
  handle_ = buffer_.AddObserver([this](const StatusReport& report) {
    {
      std::lock_guard<std::mutex> lock(mutex_);
      reports_.push_back(Report{report.state, report.value});
    }
    cv_.notify_all();
  });
}

EventRecorder::~EventRecorder() { buffer_.RemoveObserver(handle_); }

std::vector<Report> EventRecorder::Reports() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return reports_;
}

size_t EventRecorder::Size() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return reports_.size();
}

bool EventRecorder::WaitFor(const std::function<bool(const std::vector<Report>&)>& pred,
                            std::chrono::milliseconds deadline) const {
  std::unique_lock<std::mutex> lock(mutex_);
  return cv_.wait_for(lock, deadline, [this, &pred] { return pred(reports_); });
}

bool EventRecorder::WaitForCount(size_t n, std::chrono::milliseconds deadline) const {
  return WaitFor([n](const std::vector<Report>& reports) { return reports.size() >= n; },
                 deadline);
}

bool EventRecorder::WaitForReport(Report r, std::chrono::milliseconds deadline) const {
  return WaitFor(
      [r](const std::vector<Report>& reports) {
        return std::find(reports.begin(), reports.end(), r) != reports.end();
      },
      deadline);
}

void PrintTo(const Report& report, std::ostream* os) {
  *os << "{state=" << (report.state ? "true" : "false") << ", value=" << report.value << "}";
}

}  // namespace evtest
