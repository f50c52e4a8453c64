// A scenario scripts the state of simulated cameras over time: a list of steps, each setting
// the motion level and some inputs of one camera (or of all) at a time from the start of a
// cycle; the cycle then repeats. ScenarioPlayer plays one on its own thread.
//
// Threads: a Scenario is plain data. A ScenarioPlayer's thread writes the CameraStates
// (which are thread-safe); Stop() and the destructor may be called from any one thread.

#ifndef EVWATCH_SIM_SCENARIO_H_
#define EVWATCH_SIM_SCENARIO_H_

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "sim/camstate.h"

namespace evsim {

struct ScenarioStep {
  std::chrono::milliseconds at{0};             // from the start of the cycle
  int camera = -1;                             // index into the player's cameras; -1: all
  std::optional<int> motion;                   // new motion level, when set
  std::vector<std::pair<int, bool>> inputs;    // (input number, active) pairs
};

struct Scenario {
  std::vector<ScenarioStep> steps;
  std::chrono::milliseconds cycle{0};  // the steps repeat with this period; 0: play once

  // Motion and inputs of every camera change every few seconds, the first change one second
  // after the start; cameras are staggered so that their events do not all coincide.
  static Scenario Demo(int cameras);
};

class ScenarioPlayer {
 public:
  // Starts playing at once. REQUIRES: the states outlive the player; steps naming a camera
  // index beyond `cameras` are skipped.
  ScenarioPlayer(Scenario scenario, std::vector<CameraState*> cameras);
  ScenarioPlayer(const ScenarioPlayer&) = delete;
  ScenarioPlayer& operator=(const ScenarioPlayer&) = delete;
  ~ScenarioPlayer();

  void Stop();

 private:
  void Run();
  void Apply(const ScenarioStep& step);

  const Scenario scenario_;  // steps sorted by time
  const std::vector<CameraState*> cameras_;
  std::mutex mutex_;
  std::condition_variable wake_;
  bool stopping_ = false;  // guarded by mutex_
  std::thread thread_;
};

}  // namespace evsim

#endif  // EVWATCH_SIM_SCENARIO_H_
