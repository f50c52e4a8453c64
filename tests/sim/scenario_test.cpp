#include "sim/scenario.h"

#include <gtest/gtest.h>

#include <map>
#include <thread>

namespace evsim {
namespace {

using std::chrono::milliseconds;

bool WaitUntil(const std::function<bool()>& cond, milliseconds deadline = milliseconds(10000)) {
  const auto end = std::chrono::steady_clock::now() + deadline;
  while (!cond()) {
    if (std::chrono::steady_clock::now() > end) return false;
    std::this_thread::sleep_for(milliseconds(5));
  }
  return true;
}

TEST(ScenarioTest, DemoChangesMotionAndTwoInputsOfEveryCameraWithinTenSeconds) {
  const int cameras = 5;
  Scenario s = Scenario::Demo(cameras);
  ASSERT_GT(s.cycle.count(), 0);
  for (int c = 0; c < cameras; ++c) {
    std::map<std::string, milliseconds> first;
    for (const ScenarioStep& st : s.steps) {
      ASSERT_LT(st.at, s.cycle) << "a step beyond the cycle";
      if (st.camera != c) continue;
      if (st.motion) first.emplace(*st.motion ? "motion on" : "motion off", st.at);
      for (auto [n, on] : st.inputs) first.emplace("input" + std::to_string(n) + (on ? " on" : " off"), st.at);
    }
    for (const char* event : {"motion on", "motion off", "input1 on", "input1 off", "input2 on", "input2 off"}) {
      ASSERT_TRUE(first.count(event)) << "camera " << c << " never has " << event;
    }
    EXPECT_LT(first["motion on"], milliseconds(10000));
    EXPECT_LT(first["input1 on"], milliseconds(10000));
    // Idle between the two inputs for longer than a one-second poll.
    EXPECT_GT(first["input2 on"] - first["input1 off"], milliseconds(1000));
  }
}

TEST(ScenarioPlayerTest, AppliesStepsToTheirCameras) {
  CameraState a, b;
  Scenario s;
  ScenarioStep motion;
  motion.at = milliseconds(0);
  motion.camera = 1;
  motion.motion = 70;
  ScenarioStep inputs;
  inputs.at = milliseconds(20);
  inputs.camera = -1;
  inputs.inputs = {{3, true}};
  ScenarioStep beyond;
  beyond.camera = 9;  // no such camera: skipped
  beyond.motion = 5;
  s.steps = {inputs, motion, beyond};
  ScenarioPlayer player(s, {&a, &b});
  ASSERT_TRUE(WaitUntil([&] { return a.Get().Input(3) && b.Get().Input(3); }));
  EXPECT_EQ(b.Get().motion, 70);
  EXPECT_EQ(a.Get().motion, 0);
}

TEST(ScenarioPlayerTest, RepeatsTheCycle) {
  CameraState cam;
  Scenario s;
  s.cycle = milliseconds(30);
  ScenarioStep on, off;
  on.at = milliseconds(0);
  on.camera = 0;
  on.motion = 100;
  off.at = milliseconds(15);
  off.camera = 0;
  off.motion = 0;
  s.steps = {on, off};
  ScenarioPlayer player(s, {&cam});
  // Seen on, then off, then on again: the cycle came round.
  ASSERT_TRUE(WaitUntil([&] { return cam.Get().motion == 100; }));
  ASSERT_TRUE(WaitUntil([&] { return cam.Get().motion == 0; }));
  ASSERT_TRUE(WaitUntil([&] { return cam.Get().motion == 100; }));
}

TEST(ScenarioPlayerTest, StopDoesNotWaitForAFarStep) {
  CameraState cam;
  Scenario s;
  ScenarioStep later;
  later.at = std::chrono::hours(1);
  later.motion = 100;
  s.steps = {later};
  ScenarioPlayer player(s, {&cam});
  player.Stop();
  EXPECT_EQ(cam.Get().motion, 0);
  player.Stop();  // again: no effect
}

}  // namespace
}  // namespace evsim
