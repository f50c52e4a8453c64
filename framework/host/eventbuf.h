// Event buffer: where a detector reports its readings, one SetStatus() per pass.
//
// Threads: SetStatus() may be called from any number of threads at once. Observers are
// called on the reporting thread, one report at a time and in the order of the calls, so
// an observer sees a detector's reports in order. An observer must not call back into the
// same EventBuf.

#ifndef EVWATCH_FRAMEWORK_HOST_EVENTBUF_H_
#define EVWATCH_FRAMEWORK_HOST_EVENTBUF_H_

#include <chrono>
#include <cstdint>
#include <functional>
#include <mutex>
#include <vector>

struct StatusReport {
  bool state = false;
  int value = 0;
  std::chrono::system_clock::time_point time;
};

class EventBuf {
 public:
  using Observer = std::function<void(const StatusReport&)>;

  EventBuf() = default;
  EventBuf(const EventBuf&) = delete;
  EventBuf& operator=(const EventBuf&) = delete;

  // Records a reading: state, and a motion level or an input validity flag.
  void SetStatus(bool state, int value);

  // Adds an observer that sees every later report; returns a handle for RemoveObserver.
  int AddObserver(Observer observer);
  void RemoveObserver(int handle);

  // The last report (all zero before the first) and the number of reports so far.
  StatusReport Last() const;
  uint64_t Count() const;

 private:
  mutable std::mutex mutex_;
  StatusReport last_;                                // guarded by mutex_
  uint64_t count_ = 0;                               // guarded by mutex_
  int next_handle_ = 1;                              // guarded by mutex_
  std::vector<std::pair<int, Observer>> observers_;  // guarded by mutex_
};

#endif  // EVWATCH_FRAMEWORK_HOST_EVENTBUF_H_
