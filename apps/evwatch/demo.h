// `evwatch demo`: the whole system with no set-up. Runs the camera simulator (the camsim
// program beside evwatch, or the one that EVWATCH_CAMSIM names, else camsim on the PATH) as
// a child on free loopback ports with its demo scenario (motion and inputs change every few
// seconds), takes the configuration it writes for every camera, keeps the registered
// classes, runs it and prints the text format until SIGINT/SIGTERM or the duration.
//
// The simulator is a separate program so that the daemon links none of its code.
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
