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

// Whether BlockEndSignals took SIGHUP for WaitForEnd.
bool reload_taken = false;

}  // namespace

void BlockEndSignals(bool reload) {
  sigset_t set = EndSignals();
  if (reload) {
    sigaddset(&set, SIGHUP);
    reload_taken = true;
  }
  pthread_sigmask(SIG_BLOCK, &set, nullptr);
  signal(SIGPIPE, SIG_IGN);
}

EndReason WaitForEnd(std::optional<EndClock::time_point> deadline, const std::function<bool()>& failed) {
  sigset_t set = EndSignals();
  if (reload_taken) sigaddset(&set, SIGHUP);
  for (;;) {
    if (failed && failed()) return EndReason::kFailed;
    auto slice = std::chrono::milliseconds(200);
    if (deadline) {
      const auto left = *deadline - EndClock::now();
      if (left <= EndClock::duration::zero()) return EndReason::kDuration;
      if (left < slice) slice = std::chrono::duration_cast<std::chrono::milliseconds>(left) + std::chrono::milliseconds(1);
    }
    struct timespec wait = {0, static_cast<long>(slice.count()) * 1000000L};
    const int signal = sigtimedwait(&set, nullptr, &wait);
    if (signal == SIGHUP) return EndReason::kReload;
    if (signal > 0) return EndReason::kSignal;
  }
}

EndReason WaitForEnd(std::optional<double> seconds, const std::function<bool()>& failed) {
  std::optional<EndClock::time_point> deadline;
  if (seconds) {
    deadline = EndClock::now() + std::chrono::duration_cast<EndClock::duration>(std::chrono::duration<double>(*seconds));
  }
  return WaitForEnd(deadline, failed);
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
