// The loop that every polled detector runs, written once: a reading per period until the
// detector is stopped, a report per pass, and a final (false, 0) so that the host never
// keeps a stale "active" state after Stop. Runs on the detector's worker thread.

#ifndef EVWATCH_FRAMEWORK_POLLEDLOOP_H_
#define EVWATCH_FRAMEWORK_POLLEDLOOP_H_

#include <optional>

#include "framework/detector.h"
#include "framework/host/delaytimer.h"
#include "framework/host/eventbuf.h"

// The pace of the detectors that ask their camera once a second, in microseconds.
inline constexpr int kOneSecond = 1000000;

// What one pass reports through EventBuf::SetStatus.
struct PassReport {
  bool state;
  int value;
};

// A motion reading: (state, level) when the reading succeeded, else (false, 0).
inline PassReport MotionReport(int result, bool state, unsigned int level) {
  return result == 0 ? PassReport{state, static_cast<int>(level)} : PassReport{false, 0};
}

// An input reading: (state, 1) when the reading succeeded, else (false, 0); the value is a
// validity flag.
inline PassReport InputReport(int result, bool state) {
  return result == 0 ? PassReport{state, 1} : PassReport{false, 0};
}

// The loop shape itself: while detector.IsStarted() yields 1, one pass(), its report when it
// has one (a pass may return a PassReport or a std::optional<PassReport>; empty reports
// nothing), then pace(); at the end (false, 0). A no-op pace() runs passes back to back.
template <typename Pass, typename Pace>
void RunPassLoop(DetectorBase& detector, EventBuf* buffer, Pass&& pass, Pace&& pace) {
  while (detector.IsStarted() == 1) {
    std::optional<PassReport> report = pass();
    if (report) buffer->SetStatus(report->state, report->value);
    pace();
  }
  buffer->SetStatus(false, 0);
}

// Runs pass() once per period (microseconds) while detector.IsStarted() yields 1, reporting
// each PassReport it returns to buffer; then reports (false, 0). A pass may return
// std::optional<PassReport>: nullopt reports nothing, and the period is kept all the same (a
// pass that slept longer than the period starts the next one at once).
template <typename Pass>
void RunPolledLoop(DetectorBase& detector, EventBuf* buffer, int period, Pass&& pass) {
  DelayTimer timer(period);
  timer.BeginTiming();
  RunPassLoop(detector, buffer, pass, [&timer] { timer.Delay(); });
}

// RunPolledLoop with a motion pass: doMD(state, level) returns 0 for a reading.
template <typename DoMD>
void RunMotionPolledLoop(DetectorBase& detector, EventBuf* buffer, int period, DoMD&& doMD) {
  RunPolledLoop(detector, buffer, period, [&] {
    bool state = false;
    unsigned int level = 0;
    int result = doMD(state, level);
    return MotionReport(result, state, level);
  });
}

// RunPolledLoop with an input pass: doEID(state) returns 0 for a reading.
template <typename DoEID>
void RunInputPolledLoop(DetectorBase& detector, EventBuf* buffer, int period, DoEID&& doEID) {
  RunPolledLoop(detector, buffer, period, [&] {
    bool state = false;
    int result = doEID(state);
    return InputReport(result, state);
  });
}

#endif  // EVWATCH_FRAMEWORK_POLLEDLOOP_H_
