#include "apps/common/endwait.h"

#include <pthread.h>
#include <signal.h>

#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <ctime>
#include <thread>

namespace evwatch {
namespace {

sigset_t EndSignals() {
  sigset_t set;
  sigemptyset(&set);
  sigaddset(&set, SIGINT);
  sigaddset(&set, SIGTERM);
  return set;
}

}  // namespace

void BlockEndSignals() {
  sigset_t set = EndSignals();
  pthread_sigmask(SIG_BLOCK, &set, nullptr);
  signal(SIGPIPE, SIG_IGN);
}

EndReason WaitForEnd(std::optional<double> seconds, const std::function<bool()>& failed) {
  using Clock = std::chrono::steady_clock;
  const sigset_t set = EndSignals();
  const auto deadline =
      seconds ? Clock::now() + std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(*seconds))
              : Clock::time_point::max();
  for (;;) {
    if (failed && failed()) return EndReason::kFailed;
    auto slice = std::chrono::milliseconds(200);
    if (seconds) {
      const auto left = deadline - Clock::now();
      if (left <= Clock::duration::zero()) return EndReason::kDuration;
      if (left < slice) slice = std::chrono::duration_cast<std::chrono::milliseconds>(left) + std::chrono::milliseconds(1);
    }
    struct timespec wait = {0, static_cast<long>(slice.count()) * 1000000L};
    if (sigtimedwait(&set, nullptr, &wait) > 0) return EndReason::kSignal;
  }
}

void RunUnlessSignalled(const std::function<void()>& work, const std::function<void(int)>& on_signal) {
  std::atomic<bool> done{false};
  std::thread watcher([&] {
    const sigset_t set = EndSignals();
    const struct timespec slice = {0, 50 * 1000000L};
    while (!done) {
      const int signal = sigtimedwait(&set, nullptr, &slice);
      if (signal > 0) {
        on_signal(signal);
        _exit(128 + signal);
      }
    }
  });
  work();
  done = true;
  watcher.join();
}

}  // namespace evwatch
