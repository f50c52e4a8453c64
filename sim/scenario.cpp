#include "sim/scenario.h"

#include <algorithm>

namespace evsim {
namespace {

using std::chrono::milliseconds;

Scenario Sorted(Scenario scenario) {
  std::stable_sort(scenario.steps.begin(), scenario.steps.end(),
                   [](const ScenarioStep& a, const ScenarioStep& b) { return a.at < b.at; });
  return scenario;
}

}  // namespace

Scenario Scenario::Demo(int cameras) {
  // A 14-second cycle per camera: motion for three seconds, then input 1, then input 2,
  // with idle gaps longer than a one-second poll between them.
  Scenario s;
  s.cycle = milliseconds(14000);
  for (int c = 0; c < cameras; ++c) {
    const milliseconds offset((c * 700) % 3000);
    auto step = [&](int at_ms) {
      ScenarioStep st;
      st.at = (offset + milliseconds(at_ms)) % s.cycle;  // late steps wrap into the cycle
      st.camera = c;
      return st;
    };
    ScenarioStep motion_on = step(1000), motion_off = step(4000);
    motion_on.motion = 100;
    motion_off.motion = 0;
    ScenarioStep in1_on = step(5000), in1_off = step(7500);
    in1_on.inputs = {{1, true}};
    in1_off.inputs = {{1, false}};
    ScenarioStep in2_on = step(9000), in2_off = step(11500);
    in2_on.inputs = {{2, true}};
    in2_off.inputs = {{2, false}};
    for (auto* st : {&motion_on, &motion_off, &in1_on, &in1_off, &in2_on, &in2_off}) {
      s.steps.push_back(*st);
    }
  }
  return s;
}

ScenarioPlayer::ScenarioPlayer(Scenario scenario, std::vector<CameraState*> cameras)
    : scenario_(Sorted(std::move(scenario))), cameras_(std::move(cameras)) {
  thread_ = std::thread([this] { Run(); });
}

ScenarioPlayer::~ScenarioPlayer() { Stop(); }

void ScenarioPlayer::Stop() {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    stopping_ = true;
  }
  wake_.notify_all();
  if (thread_.joinable()) thread_.join();
}

void ScenarioPlayer::Run() {
  if (scenario_.steps.empty()) return;
  const auto start = std::chrono::steady_clock::now();
  for (long cycle = 0;; ++cycle) {
    const auto cycle_start = start + scenario_.cycle * cycle;
    for (const ScenarioStep& step : scenario_.steps) {
      std::unique_lock<std::mutex> lock(mutex_);
      if (wake_.wait_until(lock, cycle_start + step.at, [this] { return stopping_; })) return;
      lock.unlock();
      Apply(step);
    }
    if (scenario_.cycle.count() <= 0) return;
  }
}

void ScenarioPlayer::Apply(const ScenarioStep& step) {
  for (size_t i = 0; i < cameras_.size(); ++i) {
    if (step.camera >= 0 && static_cast<size_t>(step.camera) != i) continue;
    if (step.motion) cameras_[i]->SetMotion(*step.motion);
    for (const auto& [number, active] : step.inputs) cameras_[i]->SetInput(number, active);
  }
}

}  // namespace evsim
