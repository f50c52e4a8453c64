// `evwatch demo`: the whole system with no set-up. Starts the camera simulator in this
// process on free loopback ports with its demo scenario (motion and inputs change every few
// seconds), builds the configuration for every registered class that has an emulation,
// runs it and prints the text format until SIGINT/SIGTERM or the duration.
//
// Threads: call from main's thread after BlockEndSignals().

#ifndef EVWATCH_APPS_EVWATCH_DEMO_H_
#define EVWATCH_APPS_EVWATCH_DEMO_H_

#include <optional>
#include <ostream>

namespace evwatch {

// The exit status: 0 after a normal end, 1 when the simulator or a detector cannot start.
int RunDemo(std::optional<double> seconds, std::ostream& out, std::ostream& err);

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_DEMO_H_
