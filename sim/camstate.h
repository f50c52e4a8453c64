// State of one simulated camera: its motion level, its alarm inputs, whether it has fallen
// silent, and how many requests it has been asked. Emulations answer from it; the scenario
// player and the control API change it.
//
// Threads: every operation may be called from any thread at once (connection threads read,
// the scenario and control threads write).

#ifndef EVWATCH_SIM_CAMSTATE_H_
#define EVWATCH_SIM_CAMSTATE_H_

#include <array>
#include <atomic>
#include <cstdint>
#include <mutex>

namespace evsim {

// Inputs are numbered 1..kInputCount in the control API and the scenario; each emulation
// maps them onto its maker's own numbering.
constexpr int kInputCount = 8;

struct CameraStatus {
  int motion = 0;                            // motion level in percent, 0..100
  std::array<bool, kInputCount> inputs{};    // inputs[n - 1] is input n
  bool silent = false;                       // accept requests, never answer them

  bool Input(int number) const { return number >= 1 && number <= kInputCount && inputs[number - 1]; }
  bool AnyInput() const;
};

class CameraState {
 public:
  CameraState() = default;
  CameraState(const CameraState&) = delete;
  CameraState& operator=(const CameraState&) = delete;

  CameraStatus Get() const;
  void Set(const CameraStatus& status);
  // Clamps the level to 0..100.
  void SetMotion(int level);
  // False (and no change) when number is outside 1..kInputCount.
  bool SetInput(int number, bool active);
  void SetAllInputs(bool active);
  void SetSilent(bool silent);

  void CountRequest() { requests_.fetch_add(1, std::memory_order_relaxed); }
  uint64_t Requests() const { return requests_.load(std::memory_order_relaxed); }

 private:
  mutable std::mutex mutex_;
  CameraStatus status_;                 // guarded by mutex_
  std::atomic<uint64_t> requests_{0};   // requests received, answered or not
};

}  // namespace evsim

#endif  // EVWATCH_SIM_CAMSTATE_H_
