#include "framework/host/delaytimer.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>
#include <vector>

namespace {

using std::chrono::microseconds;

// A clock the test moves by hand; sleeping jumps to the wake-up time.
class FakeClock : public DelayTimer::Clock {
 public:
  DelayTimer::TimePoint Now() override { return now_; }
  void SleepUntil(DelayTimer::TimePoint when) override {
    sleeps_.push_back(when - start_);
    if (when > now_) now_ = when;
  }
  void Advance(microseconds d) { now_ += d; }
  microseconds Elapsed() const {
    return std::chrono::duration_cast<microseconds>(now_ - start_);
  }

  const DelayTimer::TimePoint start_ = DelayTimer::TimePoint() + std::chrono::hours(1);
  DelayTimer::TimePoint now_ = start_;
  std::vector<DelayTimer::TimePoint::duration> sleeps_;
};

TEST(DelayTimerTest, SleepsToWholePeriodsWithoutDrift) {
  FakeClock clock;
  DelayTimer timer(1000, &clock);
  timer.BeginTiming();
  for (int i = 0; i < 5; ++i) {
    clock.Advance(microseconds(300));  // the cycle's work
    timer.Delay();
  }
  ASSERT_EQ(clock.sleeps_.size(), 5u);
  for (int i = 0; i < 5; ++i) EXPECT_EQ(clock.sleeps_[i], microseconds(1000 * (i + 1)));
}

TEST(DelayTimerTest, LateCycleDoesNotSleepAndRestartsThePeriod) {
  FakeClock clock;
  DelayTimer timer(1000, &clock);
  timer.BeginTiming();
  clock.Advance(microseconds(2500));  // overran two and a half periods
  timer.Delay();
  EXPECT_TRUE(clock.sleeps_.empty());
  clock.Advance(microseconds(100));
  timer.Delay();
  ASSERT_EQ(clock.sleeps_.size(), 1u);
  EXPECT_EQ(clock.sleeps_[0], microseconds(3500));  // one period after the late mark
}

TEST(DelayTimerTest, CountsCyclesOfASimulatedSecond) {
  FakeClock clock;
  DelayTimer timer(16000, &clock);
  timer.BeginTiming();
  int cycles = 0;
  while (clock.Elapsed() < std::chrono::seconds(1)) {
    clock.Advance(microseconds(1000));
    timer.Delay();
    ++cycles;
  }
  EXPECT_EQ(cycles, 63);  // ceil(1 s / 16 ms)
}

TEST(DelayTimerTest, BeginTimingResetsTheMark) {
  FakeClock clock;
  DelayTimer timer(1000, &clock);
  clock.Advance(microseconds(5000));
  timer.BeginTiming();
  timer.Delay();
  ASSERT_EQ(clock.sleeps_.size(), 1u);
  EXPECT_EQ(clock.sleeps_[0], microseconds(6000));
}

TEST(DelayTimerTest, SystemClockSleepsAtLeastThePeriod) {
  DelayTimer timer(2000);
  auto start = std::chrono::steady_clock::now();
  timer.BeginTiming();
  for (int i = 0; i < 3; ++i) timer.Delay();
  // sleep_until never wakes early, so three periods have passed (a lower bound only).
  EXPECT_GE(std::chrono::steady_clock::now() - start, microseconds(6000));
}

TEST(DelayTimerTest, WakeAllEndsAMinuteLongSleep) {
  std::atomic<bool> sleeping{false};
  std::future<void> done = std::async(std::launch::async, [&sleeping] {
    DelayTimer timer(60 * 1000 * 1000);
    timer.BeginTiming();
    sleeping = true;
    timer.Delay();
  });
  // WakeAll reaches only a timer that is asleep already: wake until this one has returned.
  // The bound is far below the minute the timer would otherwise sleep.
  const auto give_up = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  while (done.wait_for(std::chrono::milliseconds(10)) != std::future_status::ready) {
    if (sleeping) DelayTimer::WakeAll();
    ASSERT_LT(std::chrono::steady_clock::now(), give_up) << "the timer slept on after WakeAll";
  }
}

}  // namespace
