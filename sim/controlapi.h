// The simulator's control API: reads the state of simulated cameras and changes it, over
// HTTP GET with query parameters (see simulator.h for the paths).
//
// Threads: runs on the control server's connection threads; the cameras' states are
// thread-safe and the camera list is fixed while the server runs.

#ifndef EVWATCH_SIM_CONTROLAPI_H_
#define EVWATCH_SIM_CONTROLAPI_H_

#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "sim/net/httpserver.h"

namespace evsim {

struct SimCamera;
class CameraState;

// A parsed change of state: motion=0..100, inputN=0|1, inputs=0|1, silent=0|1.
struct StateChange {
  std::optional<int> motion;
  std::optional<bool> all_inputs;
  std::vector<std::pair<int, bool>> inputs;  // (input number, active)
  std::optional<bool> silent;

  // The change that a query string ("motion=50&input2=1") asks for; nullopt and *error on
  // an unknown parameter, a bad value or an empty query.
  static std::optional<StateChange> Parse(std::string_view query, std::string* error);
  void ApplyTo(CameraState& state) const;
};

// The JSON view of one camera: name, maker, emulation, port, classes and state.
nlohmann::json CameraJson(const SimCamera& camera);

// Answers one control request. `control_port` is reported in the /cameras answer.
void HandleControlRequest(HttpConnection& connection, const std::vector<SimCamera>& cameras,
                          int control_port);

}  // namespace evsim

#endif  // EVWATCH_SIM_CONTROLAPI_H_
