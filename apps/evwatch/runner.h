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

  size_t DetectorCount() const;

  // What a reload did: detectors kept running, stopped, and started; ok false when a start
  // failed (*error then says which; what did start keeps running).
  struct Change {
    size_t kept = 0;
    size_t stopped = 0;
    size_t started = 0;
    bool ok = true;
  };
  // Moves to `next`: detectors of removed or changed cameras and changed or removed detector
  // entries stop; new and changed ones start; the others keep running, untouched. A camera is
  // changed when anything but its detector list differs; a detector when its class, its
  // constructor values or its interval do.
  Change Apply(Config next, std::string* error);

  // The longest a Stop() waits: the longest network time-out of a detector's request (the
  // pacing timers are woken).
  static constexpr int kLongestStopSeconds = 30;

  // Defined in runner.cpp; named here for its file-local helpers.
  struct CameraUnit;
  struct DetectorUnit;

 private:
  // Starts the cameras (receivers first, all at once) and then their detectors.
  bool StartCameras(const std::vector<CameraConfig>& configs, std::vector<CameraUnit*>* started,
                    std::string* error);
  // Makes the camera's objects and starts its frame receiver, if it has a frames: source.
  CameraUnit* StartCamera(const CameraConfig& config, std::string* error);
  // Waits, for all receivers at once, until each has a frame or a short while has passed.
  void WaitForFirstFrames(const std::vector<CameraUnit*>& cameras);
  bool StartDetector(const DetectorConfig& config, CameraUnit* camera, std::string* error);

  Config config_;
  Sink& sink_;
  std::ostream& log_;
  // Each camera owns its detectors, which go before its records and receiver.
  std::vector<std::unique_ptr<CameraUnit>> cameras_;
};

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_RUNNER_H_
