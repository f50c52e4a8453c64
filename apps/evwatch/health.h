// Camera health as a user sees it: one line on the log when a camera's requests start
// failing (camera, host:port, the cause in words, its detectors) and one when it answers
// again, never more than once a minute per camera while the cause stays the same; and
// whether a camera is failing now, for the text output.
//
// It learns of every request through our host's transfer notes (host:port, ok or cause) and
// maps the address to the cameras that use it (the camera's port and its stream ports).
// Lines never carry credentials: causes come from the host in words, addresses are host:port.
//
// Threads: OnTransfer and Failing from any thread (detector threads, the sink's); the log
// is written under the object's mutex.

#ifndef EVWATCH_APPS_EVWATCH_HEALTH_H_
#define EVWATCH_APPS_EVWATCH_HEALTH_H_

#include <chrono>
#include <functional>
#include <map>
#include <mutex>
#include <ostream>
#include <string>
#include <vector>

#include "apps/evwatch/config.h"
#include "host/transport/transfernote.h"

namespace evwatch {

class CameraHealth {
 public:
  using Clock = std::function<std::chrono::steady_clock::time_point()>;

  // REQUIRES: log outlives the object. `now` replaces the clock in tests.
  CameraHealth(const Config& config, std::ostream& log, Clock now = nullptr);

  // Follows a reloaded configuration: cameras that stay keep their state.
  void Update(const Config& config);

  void OnTransfer(const TransferOutcome& outcome);
  // Whether the camera's last request failed.
  bool Failing(const std::string& camera) const;

  // Least time between two lines of one camera with the same cause.
  static constexpr std::chrono::seconds kQuietTime{60};

 private:
  struct State {
    std::string name;
    std::string address;    // host:port of the camera itself
    std::string detectors;  // "motion, inputs"
    bool failing = false;
    std::string cause;
    bool said_failing = false;  // a failure line was written since the last answer
    std::string said_cause;
    std::chrono::steady_clock::time_point said_at;
  };

  // Builds cameras_ and by_address_ from the configuration; REQUIRES mutex_ held.
  void Build(const Config& config);

  Clock now_;
  std::ostream& log_;
  mutable std::mutex mutex_;
  std::vector<State> cameras_;
  std::multimap<std::string, size_t> by_address_;  // "host:port" -> camera index
};

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_HEALTH_H_
