#include "framework/host/delaytimer.h"

#include <thread>

namespace {

class SteadyClock : public DelayTimer::Clock {
 public:
  DelayTimer::TimePoint Now() override { return std::chrono::steady_clock::now(); }
  void SleepUntil(DelayTimer::TimePoint when) override { std::this_thread::sleep_until(when); }
};

}  // namespace

DelayTimer::Clock* DelayTimer::SystemClock() {
  static SteadyClock clock;
  return &clock;
}

DelayTimer::DelayTimer(int period) : DelayTimer(period, SystemClock()) {}

DelayTimer::DelayTimer(int period, Clock* clock)
    : period_(period > 0 ? period : 0), clock_(clock), mark_(clock->Now()) {}

void DelayTimer::BeginTiming() { mark_ = clock_->Now(); }

void DelayTimer::Delay() {
  TimePoint next = mark_ + period_;
  TimePoint now = clock_->Now();
  if (now < next) {
    clock_->SleepUntil(next);
    mark_ = next;  // whole periods: the pace does not drift with sleep overshoot
  } else {
    mark_ = now;  // overran: start the next period now rather than bursting to catch up
  }
}
