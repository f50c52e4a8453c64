#include "framework/host/delaytimer.h"

#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace {

// The wake-up of WakeAll: sleepers wait on one condition; each WakeAll starts a new round.
std::mutex wake_mutex;
std::condition_variable wake_condition;
uint64_t wake_round = 0;

// The monotonic clock, whose sleep WakeAll ends.
class SteadyClock : public DelayTimer::Clock {
 public:
  DelayTimer::TimePoint Now() override { return std::chrono::steady_clock::now(); }
  void SleepUntil(DelayTimer::TimePoint when) override {
    std::unique_lock<std::mutex> lock(wake_mutex);
    const uint64_t round = wake_round;
    wake_condition.wait_until(lock, when, [round] { return wake_round != round; });
  }
};

}  // namespace

void DelayTimer::WakeAll() {
  {
    std::lock_guard<std::mutex> lock(wake_mutex);
    ++wake_round;
  }
  wake_condition.notify_all();
}

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
    // Whole periods, so the pace does not drift with sleep overshoot; woken early, the next
    // period starts now.
    const TimePoint after = clock_->Now();
    mark_ = after < next ? after : next;
  } else {
    mark_ = now;  // overran: start the next period now rather than bursting to catch up
  }
}
