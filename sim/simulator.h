// The camera simulator: simulated cameras of chosen emulations, each an HTTP server on its
// own loopback port answering from its CameraState (plus a raw TCP server on a second port
// for an emulation with a TCP service; a camera whose service has a fixed port listens on a
// loopback address of its own), a control API to read and set those
// states, and optionally the demo scenario playing over them. Used by camsim, the demo,
// the tests and the benchmarks.
//
// Control API (GET only, answers are JSON):
//   /cameras                         every camera with its port, classes and state
//   /cameras/NAME                    one camera
//   /cameras/NAME/set?PARAMS         changes the state of camera NAME, or of all for "all";
//                                    PARAMS: motion=0..100, inputN=0|1 (N = 1..8),
//                                    inputs=0|1 (all eight), silent=0|1
//
// Threads: Start() and Stop() from one thread; while started, cameras are served on server
// threads and the states may be read and changed from any thread.

#ifndef EVWATCH_SIM_SIMULATOR_H_
#define EVWATCH_SIM_SIMULATOR_H_

#include <atomic>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "sim/camstate.h"
#include "sim/emulation.h"
#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"
#include "sim/scenario.h"

namespace evsim {

struct SimOptions {
  std::vector<std::string> emulations;  // emulation keys; empty: every emulation
  int count = 1;                        // cameras of each emulation
  std::string host = "127.0.0.1";       // address that every server listens on
  int control_port = 0;                 // 0: a free port
  AuthScheme auth = AuthScheme::kNone;  // what the cameras ask of a client
  std::string user;
  std::string password;
  bool scenario = false;                // play Scenario::Demo over the cameras
  // Where a camera whose TCP service has a fixed port listens (its HTTP server too): an
  // address; "auto": 127.0.0.1 when the port is free there, else a random loopback address,
  // one per camera; empty: such cameras run without their TCP service, on `host`.
  std::string fixed_port_host;
};

struct SimCamera {
  std::string name;             // emulation key and number: "canon1"
  const Emulation* emulation;   // never null
  int port = 0;
  CameraState* state = nullptr;  // owned by the simulator
  int tcp_port = 0;              // the TCP service's port; 0 when the emulation has none
  std::string host;              // the camera's own address; empty: SimOptions::host
};

class Simulator {
 public:
  Simulator();
  Simulator(const Simulator&) = delete;
  Simulator& operator=(const Simulator&) = delete;
  ~Simulator();

  // Starts every camera, the control API and the scenario. On failure (unknown emulation,
  // a port that cannot be bound) stops what it started, sets *error and returns false.
  // REQUIRES: not started.
  bool Start(const SimOptions& options, std::string* error);
  // Stops the scenario and every server; waiting handlers are woken. Idempotent.
  void Stop();

  int ControlPort() const;
  const std::vector<SimCamera>& Cameras() const { return cameras_; }
  // The camera of that name, or null.
  const SimCamera* Find(const std::string& name) const;
  // {"control_port": P, "cameras": [...]} as the control API's /cameras gives it.
  nlohmann::json Describe() const;

 private:
  struct Station;

  std::vector<std::unique_ptr<Station>> stations_;  // one per camera, same order as cameras_
  std::vector<SimCamera> cameras_;
  std::unique_ptr<HttpServer> control_;
  std::atomic<int> control_port_{0};  // control_'s port once it listens; 0 before and after
  std::unique_ptr<ScenarioPlayer> player_;
};

}  // namespace evsim

#endif  // EVWATCH_SIM_SIMULATOR_H_
