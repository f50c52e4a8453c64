// Records every report an EventBuf receives, for tests, and waits for conditions on them.
//
// Threads: reports arrive on detector threads; queries and waits come from the test thread.

#ifndef EVWATCH_TESTS_SUPPORT_EVENTRECORDER_H_
#define EVWATCH_TESTS_SUPPORT_EVENTRECORDER_H_

#include <chrono>
#include <condition_variable>
#include <functional>
#include <iosfwd>
#include <mutex>
#include <utility>
#include <vector>

#include "framework/host/eventbuf.h"

namespace evtest {

struct Report {
  bool state;
  int value;
  bool operator==(const Report& other) const {
    return state == other.state && value == other.value;
  }
};

class EventRecorder {
 public:
  // Observes buffer from now until the recorder goes away.
  // REQUIRES: buffer outlives the recorder.
  explicit EventRecorder(EventBuf& buffer);
  ~EventRecorder();
  EventRecorder(const EventRecorder&) = delete;
  EventRecorder& operator=(const EventRecorder&) = delete;

  std::vector<Report> Reports() const;
  size_t Size() const;
  // Waits until pred(reports) holds; false when the deadline passes first.
  bool WaitFor(const std::function<bool(const std::vector<Report>&)>& pred,
               std::chrono::milliseconds deadline = std::chrono::seconds(10)) const;
  // Waits until at least n reports have arrived.
  bool WaitForCount(size_t n, std::chrono::milliseconds deadline = std::chrono::seconds(10)) const;
  // Waits until a report equal to r has arrived.
  bool WaitForReport(Report r, std::chrono::milliseconds deadline = std::chrono::seconds(10)) const;

 private:
  EventBuf& buffer_;
  int handle_;
  mutable std::mutex mutex_;
  mutable std::condition_variable cv_;
  std::vector<Report> reports_;  // guarded by mutex_
};

// Prints a Report in test failure messages.
void PrintTo(const Report& report, std::ostream* os);

}  // namespace evtest

#endif  // EVWATCH_TESTS_SUPPORT_EVENTRECORDER_H_
