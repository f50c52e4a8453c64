#include "sim/camstate.h"

#include <gtest/gtest.h>

namespace evsim {
namespace {

TEST(CameraStateTest, StartsStillIdleAndTalking) {
  CameraState s;
  CameraStatus st = s.Get();
  EXPECT_EQ(st.motion, 0);
  EXPECT_FALSE(st.AnyInput());
  EXPECT_FALSE(st.silent);
  EXPECT_EQ(s.Requests(), 0u);
}

TEST(CameraStateTest, MotionIsClampedToPercent) {
  CameraState s;
  s.SetMotion(150);
  EXPECT_EQ(s.Get().motion, 100);
  s.SetMotion(-3);
  EXPECT_EQ(s.Get().motion, 0);
  s.SetMotion(42);
  EXPECT_EQ(s.Get().motion, 42);
}

TEST(CameraStateTest, InputsAreNumberedFromOne) {
  CameraState s;
  EXPECT_TRUE(s.SetInput(1, true));
  EXPECT_TRUE(s.SetInput(kInputCount, true));
  EXPECT_FALSE(s.SetInput(0, true));
  EXPECT_FALSE(s.SetInput(kInputCount + 1, true));
  CameraStatus st = s.Get();
  EXPECT_TRUE(st.Input(1));
  EXPECT_FALSE(st.Input(2));
  EXPECT_TRUE(st.Input(kInputCount));
  EXPECT_FALSE(st.Input(0));
  EXPECT_FALSE(st.Input(kInputCount + 1));
  s.SetAllInputs(false);
  EXPECT_FALSE(s.Get().AnyInput());
  s.SetAllInputs(true);
  EXPECT_TRUE(s.Get().Input(5));
}

TEST(CameraStateTest, SetReplacesEverything) {
  CameraState s;
  CameraStatus st;
  st.motion = 300;
  st.inputs[2] = true;
  st.silent = true;
  s.Set(st);
  EXPECT_EQ(s.Get().motion, 100);
  EXPECT_TRUE(s.Get().Input(3));
  EXPECT_TRUE(s.Get().silent);
  s.SetSilent(false);
  EXPECT_FALSE(s.Get().silent);
}

TEST(CameraStateTest, CountsRequests) {
  CameraState s;
  s.CountRequest();
  s.CountRequest();
  EXPECT_EQ(s.Requests(), 2u);
}

}  // namespace
}  // namespace evsim
