// Runs a configuration: builds each camera's Camera, CameraAPI and (for a camera with a
// frames: source) frame buffer and its receiver, creates every detector through the class
// registry, binds each to its own EventBuf whose reports go to the sink, and starts them.
// Stop() stops every detector at once, each on its own thread (a stop may wait out a
// network time-out), and destroys them, so every detector's final report reaches the sink.
//
// Threads: Start() and Stop() from one thread. Reports arrive on detector threads.

#ifndef EVWATCH_APPS_EVWATCH_RUNNER_H_
#define EVWATCH_APPS_EVWATCH_RUNNER_H_

#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "apps/evwatch/config.h"
#include "apps/evwatch/sink.h"

namespace evwatch {

class Runner {
 public:
  // REQUIRES: sink and log outlive the runner. `log` receives warnings.
  Runner(Config config, Sink& sink, std::ostream& log);
  Runner(const Runner&) = delete;
  Runner& operator=(const Runner&) = delete;
  ~Runner();

  // Creates, binds and starts every detector. On a failure stops and destroys what it has
  // started, sets *error (one line) and returns false. REQUIRES: called once.
  bool Start(std::string* error);
  // Stops and destroys every detector, all at once; returns when the last is gone.
  // Idempotent.
  void Stop();

  size_t DetectorCount() const { return detectors_.size(); }

  // The longest a Stop() waits: the longest network time-out of a detector's request (the
  // pacing timers are woken).
  static constexpr int kLongestStopSeconds = 30;

 private:
  struct CameraUnit;
  struct DetectorUnit;

  // Makes the camera's objects and starts its frame receiver, if it has a frames: source.
  bool StartCamera(const CameraConfig& config, std::string* error);
  // Waits, for all receivers at once, until each has a frame or a short while has passed.
  void WaitForFirstFrames();
  bool StartDetectors(const CameraConfig& config, CameraUnit* camera, std::string* error);

  const Config config_;
  Sink& sink_;
  std::ostream& log_;
  std::vector<std::unique_ptr<CameraUnit>> cameras_;
  // Destroyed before cameras_: a detector uses its camera's objects until it is deleted.
  std::vector<std::unique_ptr<DetectorUnit>> detectors_;
};

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_RUNNER_H_
