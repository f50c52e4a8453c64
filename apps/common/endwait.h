// How a run ends: SIGINT or SIGTERM, the end of a duration, or a failed output.
//
// Threads: BlockEndSignals() first thing in main, before any thread exists, so that every
// later thread inherits the blocked mask and only WaitForEnd() takes those signals.

#ifndef EVWATCH_APPS_COMMON_ENDWAIT_H_
#define EVWATCH_APPS_COMMON_ENDWAIT_H_

#include <chrono>
#include <functional>
#include <optional>

namespace evwatch {

enum class EndReason { kSignal, kDuration, kFailed, kReload };

// Blocks SIGINT and SIGTERM (and SIGHUP when `reload`) for WaitForEnd() to take, and ignores
// SIGPIPE so that a closed output is a failed write instead of a silent death.
void BlockEndSignals(bool reload = false);

// Returns at SIGINT or SIGTERM, at SIGHUP when BlockEndSignals took it (kReload), at
// `deadline` (never when nullopt), or once `failed()` holds (checked a few times a second).
using EndClock = std::chrono::steady_clock;
EndReason WaitForEnd(std::optional<EndClock::time_point> deadline, const std::function<bool()>& failed);
// The same with the deadline `seconds` from now.
EndReason WaitForEnd(std::optional<double> seconds, const std::function<bool()>& failed);

// Runs work() (a stop in progress). A SIGINT or SIGTERM meanwhile calls on_signal(signal) and
// ends the process at once with status 128 + the signal's number (130, 143).
void RunUnlessSignalled(const std::function<void()>& work, const std::function<void(int)>& on_signal);

}  // namespace evwatch

#endif  // EVWATCH_APPS_COMMON_ENDWAIT_H_
