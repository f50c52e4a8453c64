// The cameras a simulator runs, as a configuration that watches them describes them: one
// camera entry per simulated camera, with the detector entries that its emulation names.
// camsim writes it with --evwatch-config (and `evwatch demo` reads that file); tests run
// the daemon's parts on it.
//
// Threads: a pure function of its arguments.

#ifndef EVWATCH_APPS_CAMSIM_SIMWATCH_H_
#define EVWATCH_APPS_CAMSIM_SIMWATCH_H_

#include <functional>
#include <string>
#include <vector>

#include "apps/common/watchconfig.h"
#include "sim/simulator.h"

namespace evsim {

struct SimWatchOptions {
  std::string host = "127.0.0.1";  // where evwatch finds the cameras
  std::string user;                // the credentials the cameras ask for
  std::string password;
  // Keeps only the detector entries whose class it accepts; null: keeps all. A camera left
  // without entries is left out.
  std::function<bool(const std::string& cls)> keep;
};

std::vector<evwatch::WatchedCamera> SimWatch(const std::vector<SimCamera>& cameras,
                                             const SimWatchOptions& options);

}  // namespace evsim

#endif  // EVWATCH_APPS_CAMSIM_SIMWATCH_H_
