// The detector interface and the base every detector class derives from.
//
// A host constructs a detector for one camera, binds it to an EventBuf with Init(), starts
// its worker thread with Start(), and later stops and deletes it. The worker thread runs the
// class's EventDetecor() loop, which reports one reading per pass through
// EventBuf::SetStatus() and a final (false, 0) when the loop ends.
//
// Threads: the host's thread calls the constructor, Init, Start, Stop, IsStarted and the
// destructor; the worker thread calls EventDetecor and, once per pass, IsStarted. The
// detector's mutex guards the run flag only; Init is to be called before Start.
//
// Destruction: the worker thread runs the concrete class's code, so it must end before the
// concrete part of the object is destroyed. Every concrete detector's destructor therefore
// calls StopIfStarted() first; ~DetectorBase stops a detector that is still running as the
// last line of defence.

#ifndef EVWATCH_FRAMEWORK_DETECTOR_H_
#define EVWATCH_FRAMEWORK_DETECTOR_H_

#include <pthread.h>

#include <climits>

class EventBuf;

// The longest interval, in milliseconds, whose microseconds an int holds (about 35 minutes).
inline constexpr int kMaxIntervalMillis = INT_MAX / 1000;

// millis in microseconds, saturating at the longest interval: a longer interval waits the
// longest instead of overflowing.
inline int MillisToMicros(int millis) {
  if (millis <= 0) return 0;
  return millis >= kMaxIntervalMillis ? kMaxIntervalMillis * 1000 : millis * 1000;
}

class EventDetector {
 public:
  virtual int Init(EventBuf* buffer, int interval) = 0;
  virtual int Start() = 0;
  virtual int Stop() = 0;
  virtual bool IsStarted() = 0;
  virtual ~EventDetector() {}
  // The worker loop. The name is the interface's own and is kept as it is.
  virtual int EventDetecor() = 0;
};

class DetectorBase : public EventDetector {
 public:
  DetectorBase();
  DetectorBase(const DetectorBase&) = delete;
  DetectorBase& operator=(const DetectorBase&) = delete;

  // Binds the event buffer and the polling interval in milliseconds.
  // Returns -1 and changes nothing when buffer is null or interval <= 0; else 0.
  int Init(EventBuf* buffer, int interval) override;
  // Starts the worker thread. Returns -1 when no buffer is bound or the interval is below
  // 1, -2 when already started, else 0.
  int Start() override;
  // Clears the run flag and joins the worker thread, so it returns after at most the
  // pass in progress. Returns -2 when not started, else 0.
  int Stop() override;
  bool IsStarted() override;
  // Stops a started detector before it goes away.
  ~DetectorBase() override;

  // Thread entry: runs detector->EventDetecor() and returns its result.
  static void* DetThreadFunc(void* detector);

  // The bound polling interval in milliseconds, and in microseconds for a pacing timer.
  int Interval() const { return interval_; }
  int IntervalMicros() const { return MillisToMicros(interval_); }

 protected:
  // Stop() when started; the first step of every concrete destructor.
  void StopIfStarted() {
    if (IsStarted() == 1) Stop();
  }

  pthread_t thread_;         // valid only while started
  pthread_mutex_t mutex_;    // guards run_
  EventBuf* event_buffer_;   // where readings go; not owned
  bool run_;                 // true from Start() until Stop()

 private:
  int interval_;  // polling interval in milliseconds; read through Interval()
};

#endif  // EVWATCH_FRAMEWORK_DETECTOR_H_
