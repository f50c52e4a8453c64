#include "sim/camstate.h"

#include <algorithm>

namespace evsim {

bool CameraStatus::AnyInput() const {
  return std::any_of(inputs.begin(), inputs.end(), [](bool on) { return on; });
}

CameraStatus CameraState::Get() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return status_;
}

void CameraState::Set(const CameraStatus& status) {
  std::lock_guard<std::mutex> lock(mutex_);
  status_ = status;
  status_.motion = std::clamp(status_.motion, 0, 100);
}

void CameraState::SetMotion(int level) {
  std::lock_guard<std::mutex> lock(mutex_);
  status_.motion = std::clamp(level, 0, 100);
}

bool CameraState::SetInput(int number, bool active) {
  if (number < 1 || number > kInputCount) return false;
  std::lock_guard<std::mutex> lock(mutex_);
  status_.inputs[number - 1] = active;
  return true;
}

void CameraState::SetAllInputs(bool active) {
  std::lock_guard<std::mutex> lock(mutex_);
  status_.inputs.fill(active);
}

void CameraState::SetSilent(bool silent) {
  std::lock_guard<std::mutex> lock(mutex_);
  status_.silent = silent;
}

}  // namespace evsim
