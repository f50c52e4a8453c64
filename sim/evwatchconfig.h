// Writes the evwatch configuration that watches simulated cameras: one camera entry per
// simulated camera, with the detector entries that its emulation names. The result is JSON,
// which evwatch reads as YAML.
//
// Threads: a pure function of its arguments.

#ifndef EVWATCH_SIM_EVWATCHCONFIG_H_
#define EVWATCH_SIM_EVWATCHCONFIG_H_

#include <functional>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "sim/simulator.h"

namespace evsim {

struct EvwatchConfigOptions {
  std::string host = "127.0.0.1";  // where evwatch finds the cameras
  std::string user;                // the credentials the cameras ask for
  std::string password;
  int interval = 500;              // the configuration's default interval, ms
  // Keeps only the detector entries whose class it accepts; null: keeps all. A camera left
  // without entries is left out.
  std::function<bool(const std::string& cls)> keep;
};

nlohmann::ordered_json EvwatchConfig(const std::vector<SimCamera>& cameras,
                                     const EvwatchConfigOptions& options);

}  // namespace evsim

#endif  // EVWATCH_SIM_EVWATCHCONFIG_H_
