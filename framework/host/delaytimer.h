// Pacing timer of the detector loops. Delay() waits out the rest of the period since the
// previous mark and marks again; marks advance by whole periods, so the pace does not drift,
// and a cycle that overran its period does not sleep (the next period starts now).
//
// A timer belongs to one thread. The clock can be replaced (tests count cycles against a
// fake clock instead of measuring wall time).
//
// Shutting down: a host that clears detectors' run flags calls WakeAll() (from any thread),
// so that every timer sleeping on the system clock returns at once instead of waiting out a
// long interval; each loop then sees its run flag at the top of its next pass. A timer woken
// while its detector keeps running starts its next period there, as after an overrun.

#ifndef EVWATCH_FRAMEWORK_HOST_DELAYTIMER_H_
#define EVWATCH_FRAMEWORK_HOST_DELAYTIMER_H_

#include <chrono>

class DelayTimer {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  // Source of time and of sleeping. The default is the monotonic clock.
  class Clock {
   public:
    virtual ~Clock() = default;
    virtual TimePoint Now() = 0;
    virtual void SleepUntil(TimePoint when) = 0;
  };

  // period in microseconds.
  explicit DelayTimer(int period);
  // REQUIRES: clock outlives the timer.
  DelayTimer(int period, Clock* clock);

  DelayTimer(const DelayTimer&) = delete;
  DelayTimer& operator=(const DelayTimer&) = delete;

  // Marks the start of the first cycle.
  void BeginTiming();
  // Sleeps until one period after the previous mark (not at all when that is past), then
  // marks the start of the next cycle.
  void Delay();

  // The default clock (steady_clock and a real sleep).
  static Clock* SystemClock();

  // Ends the sleep of every timer on the system clock that is in Delay() now.
  static void WakeAll();

 private:
  std::chrono::microseconds period_;
  Clock* clock_;
  TimePoint mark_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_DELAYTIMER_H_
