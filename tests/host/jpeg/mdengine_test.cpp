#include "framework/host/mdengine.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sim/scene/scene.h"

namespace {

using evsim::Scene;
using evsim::SceneObject;
using evsim::SceneOptions;

constexpr int kWidth = 320;
constexpr int kHeight = 240;

// An engine state set up for each test and released after it.
class MdEngineTest : public ::testing::TestWithParam<bool> {
 protected:
  void SetUp() override {
    ASSERT_EQ(MD_CreateDetection(&state_), MD_OK);
    ASSERT_EQ(MD_EnableFastMD(&state_, GetParam() ? 1 : 0), MD_OK);
  }
  void TearDown() override { EXPECT_EQ(MD_FinishDetection(&state_), MD_OK); }

  int Feed(const std::string& jpeg, int* level) {
    *level = -1;
    return MD_DetectMotionSeq(&state_, jpeg.data(), static_cast<int>(jpeg.size()), level);
  }

  struct Reading {
    int result;
    int level;
  };
  // Steps the scene and feeds `frames` frames, one reading each.
  std::vector<Reading> Run(Scene& scene, int frames) {
    std::vector<Reading> readings;
    for (int i = 0; i < frames; ++i) {
      scene.Step();
      Reading r{0, -1};
      r.result = Feed(scene.Jpeg(), &r.level);
      readings.push_back(r);
    }
    return readings;
  }
  // Feeds the scene's first frame, which must become the reference.
  void Reference(Scene& scene) {
    int level = -1;
    ASSERT_EQ(Feed(scene.Jpeg(), &level), MD_REFERENCE);
    EXPECT_EQ(level, 0);
  }

  static SceneOptions Options(uint32_t seed, double noise = 3.0) {
    SceneOptions o;
    o.width = kWidth;
    o.height = kHeight;
    o.seed = seed;
    o.noise = noise;
    return o;
  }
  static SceneObject Mover(double x, double y, double size, double dx = 0.04) {
    SceneObject o;
    o.x = x;
    o.y = y;
    o.width = size;
    o.height = size;
    o.dx = dx;
    o.dy = dx / 2;
    return o;
  }

  MD_DETECTION state_{nullptr};
};

TEST_P(MdEngineTest, CreateGivesSensitivity90AndThreshold10) {
  int sensitivity = -1, threshold = -1;
  EXPECT_EQ(MD_GetMDSensitivity(&state_, &sensitivity), MD_OK);
  EXPECT_EQ(MD_GetMDThreshold(&state_, &threshold), MD_OK);
  EXPECT_EQ(sensitivity, 90);
  EXPECT_EQ(threshold, 10);
}

TEST_P(MdEngineTest, SettersRefuseValuesAbove100AndKeepTheOldOne) {
  EXPECT_EQ(MD_SetMDSensitivity(&state_, 100), MD_OK);
  EXPECT_EQ(MD_SetMDThreshold(&state_, 0), MD_OK);
  EXPECT_GT(MD_SetMDSensitivity(&state_, 101), 0);
  EXPECT_GT(MD_SetMDThreshold(&state_, 255), 0);
  EXPECT_GT(MD_SetMDSensitivity(&state_, -1), 0);
  int sensitivity = -1, threshold = -1;
  MD_GetMDSensitivity(&state_, &sensitivity);
  MD_GetMDThreshold(&state_, &threshold);
  EXPECT_EQ(sensitivity, 100);
  EXPECT_EQ(threshold, 0);
}

TEST_P(MdEngineTest, NullStateOrOutputIsRefused) {
  int value = 0;
  EXPECT_GT(MD_CreateDetection(nullptr), 0);
  EXPECT_GT(MD_SetMDSensitivity(nullptr, 50), 0);
  EXPECT_GT(MD_GetMDThreshold(nullptr, &value), 0);
  EXPECT_GT(MD_GetMDThreshold(&state_, nullptr), 0);
  EXPECT_GT(MD_DetectMotionSeq(nullptr, "x", 1, &value), 0);
  MD_DETECTION finished{nullptr};
  ASSERT_EQ(MD_CreateDetection(&finished), MD_OK);
  ASSERT_EQ(MD_FinishDetection(&finished), MD_OK);
  EXPECT_GT(MD_FinishDetection(&finished), 0);
  EXPECT_GT(MD_SetMDThreshold(&finished, 5), 0);
}

TEST_P(MdEngineTest, FirstFrameAfterResetIsTheReference) {
  Scene scene(Options(1));
  Reference(scene);
  int level = -1;
  EXPECT_EQ(Feed(scene.Jpeg(), &level), MD_NO_MOTION);
  EXPECT_EQ(MD_DetectMotionSeq(&state_, nullptr, 0, nullptr), MD_OK);
  Reference(scene);
  EXPECT_EQ(Feed(scene.Jpeg(), &level), MD_NO_MOTION);
}

TEST_P(MdEngineTest, FrameOfAnotherSizeIsTheReference) {
  Scene scene(Options(2));
  SceneOptions other = Options(2);
  other.width = 352;
  other.height = 288;
  Scene larger(other);
  Reference(scene);
  Reference(larger);
  int level = -1;
  EXPECT_EQ(Feed(larger.Jpeg(), &level), MD_NO_MOTION);
  Reference(scene);
}

TEST_P(MdEngineTest, SwitchingModeMakesTheNextFrameTheReference) {
  Scene scene(Options(3));
  Reference(scene);
  ASSERT_EQ(MD_EnableFastMD(&state_, GetParam() ? 0 : 1), MD_OK);
  Reference(scene);
}

TEST_P(MdEngineTest, PureNoiseGivesNoMotion) {
  MD_SetMDSensitivity(&state_, 100);
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(4, 10.0));
  Reference(scene);
  for (const Reading& r : Run(scene, 12)) {
    EXPECT_EQ(r.result, MD_NO_MOTION);
    EXPECT_EQ(r.level, 0);
  }
}

TEST_P(MdEngineTest, MovingObjectInsideARangeGivesMotionWithALevelThatGrowsWithItsSize) {
  MD_SetMDThreshold(&state_, 1);
  std::vector<int> levels;
  for (double size : {0.15, 0.35}) {
    MD_DetectMotionSeq(&state_, nullptr, 0, nullptr);
    Scene scene(Options(5));
    scene.AddObject(Mover(0.1, 0.1, size));
    Reference(scene);
    int lowest = 100;
    for (const Reading& r : Run(scene, 8)) {
      EXPECT_EQ(r.result, MD_MOTION) << "size " << size;
      lowest = std::min(lowest, r.level);
    }
    levels.push_back(lowest);
  }
  // The object covers 2.25% and then 12.25% of the frame.
  EXPECT_GE(levels[0], 1);
  EXPECT_LE(levels[0], 6);
  EXPECT_GT(levels[1], 2 * levels[0]);
  EXPECT_LE(levels[1], 25);
}

TEST_P(MdEngineTest, SameObjectOutsideEveryRangeGivesNoMotion) {
  MD_SetMDThreshold(&state_, 1);
  const MD_RECT left_half = {0, 0, 5000, 10000, 0};
  const MD_RECT bottom_left = {8000, 0, 4000, 10000, 0};
  ASSERT_EQ(MD_SetDetectRange(&state_, &left_half), MD_OK);
  ASSERT_EQ(MD_SetDetectRange(&state_, &bottom_left), MD_OK);
  Scene scene(Options(6));
  SceneObject object = Mover(0.6, 0.1, 0.3, 0.02);
  object.dy = 0.02;
  scene.AddObject(object);
  Reference(scene);
  for (const Reading& r : Run(scene, 10)) {
    EXPECT_EQ(r.result, MD_NO_MOTION);
    EXPECT_EQ(r.level, 0);
  }
}

TEST_P(MdEngineTest, ObjectInsideOneOfSeveralRangesGivesMotion) {
  MD_SetMDThreshold(&state_, 1);
  const MD_RECT top_right = {0, 5000, 10000, 5000, 0};
  const MD_RECT bottom_left = {5000, 0, 5000, 10000, 0};
  ASSERT_EQ(MD_SetDetectRange(&state_, &top_right), MD_OK);
  ASSERT_EQ(MD_SetDetectRange(&state_, &bottom_left), MD_OK);
  Scene scene(Options(7));
  SceneObject object = Mover(0.1, 0.6, 0.25, 0.03);
  object.dy = 0;
  scene.AddObject(object);
  Reference(scene);
  for (const Reading& r : Run(scene, 6)) {
    EXPECT_EQ(r.result, MD_MOTION);
    EXPECT_GT(r.level, 0);
  }
}

TEST_P(MdEngineTest, BrightnessStepGivesNoMotion) {
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(8));
  Reference(scene);
  Run(scene, 2);
  const double steps[][2] = {{1.3, 0}, {1.3, 20}, {0.75, 0}, {1.0, -25}, {1.0, 0}};
  for (const auto& step : steps) {
    scene.SetBrightness(step[0], step[1]);
    for (const Reading& r : Run(scene, 3)) {
      EXPECT_EQ(r.result, MD_NO_MOTION) << "gain " << step[0] << " offset " << step[1];
      EXPECT_EQ(r.level, 0) << "gain " << step[0] << " offset " << step[1];
    }
  }
}

TEST_P(MdEngineTest, BrightnessRampGivesNoMotion) {
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(9));
  Reference(scene);
  for (int i = 1; i <= 20; ++i) {
    scene.SetBrightness(1.0 - 0.02 * i, 0);
    for (const Reading& r : Run(scene, 1)) EXPECT_EQ(r.result, MD_NO_MOTION) << "frame " << i;
  }
}

TEST_P(MdEngineTest, ObjectMovingDuringABrightnessStepIsStillMotion) {
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(10));
  scene.AddObject(Mover(0.1, 0.1, 0.3));
  Reference(scene);
  scene.SetBrightness(1.25, 0);
  for (const Reading& r : Run(scene, 4)) EXPECT_EQ(r.result, MD_MOTION);
}

TEST_P(MdEngineTest, ObjectThatStopsIsNoMotionFromItsFirstStillFrame) {
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(11));
  const int object = scene.AddObject(Mover(0.1, 0.1, 0.3));
  Reference(scene);
  for (const Reading& r : Run(scene, 4)) EXPECT_EQ(r.result, MD_MOTION);
  // Nothing of it moves any more: it is background from the first still frame.
  scene.Object(object).dx = scene.Object(object).dy = 0;
  for (const Reading& r : Run(scene, 4)) {
    EXPECT_EQ(r.result, MD_NO_MOTION);
    EXPECT_EQ(r.level, 0);
  }
}

TEST_P(MdEngineTest, SensitivityDecidesWhetherAFaintObjectCounts) {
  MD_SetMDThreshold(&state_, 1);
  Scene scene(Options(12, 1.0));
  // A faint object: the whole scene but the object dims, so only its contrast is left.
  SceneObject faint = Mover(0.1, 0.1, 0.3);
  scene.AddObject(faint);
  scene.SetBrightness(0.08, 110);
  Reference(scene);
  MD_SetMDSensitivity(&state_, 100);
  for (const Reading& r : Run(scene, 3)) EXPECT_EQ(r.result, MD_MOTION);
  MD_SetMDSensitivity(&state_, 0);
  for (const Reading& r : Run(scene, 3)) EXPECT_EQ(r.result, MD_NO_MOTION);
}

TEST_P(MdEngineTest, ThresholdIsTheLevelFromWhichAFrameIsMotion) {
  Scene scene(Options(13));
  scene.AddObject(Mover(0.1, 0.1, 0.3));
  Reference(scene);
  std::vector<Reading> readings = Run(scene, 1);
  ASSERT_GT(readings[0].level, 1);
  const int level = readings[0].level;
  MD_SetMDThreshold(&state_, level + 3);
  for (const Reading& r : Run(scene, 3)) {
    EXPECT_EQ(r.result, r.level >= level + 3 ? MD_MOTION : MD_NO_MOTION);
  }
  MD_SetMDThreshold(&state_, 1);
  for (const Reading& r : Run(scene, 3)) EXPECT_EQ(r.result, MD_MOTION);
}

TEST_P(MdEngineTest, CorruptFrameGivesAnErrorAndTheNextGoodFrameWorks) {
  Scene scene(Options(14));
  Reference(scene);
  const std::string good = scene.Jpeg();
  std::string corrupt = good;
  for (size_t i = corrupt.size() / 3; i < corrupt.size() / 3 + 200; ++i)
    corrupt[i] = static_cast<char>(0xA5 ^ i);
  const std::vector<std::string> bad = {
      good.substr(0, good.size() / 2),  // truncated
      corrupt,
      std::string("not a jpeg at all"),
      std::string("\xFF\xD8\xFF\xD9", 4),  // SOI, EOI: no picture
      std::string(),
  };
  for (const std::string& frame : bad) {
    int level = -1;
    const int result = Feed(frame, &level);
    EXPECT_NE(result, MD_MOTION);
    EXPECT_NE(result, MD_NO_MOTION);
    EXPECT_NE(result, MD_REFERENCE);
    EXPECT_GT(result, 0);
    int after = -1;
    EXPECT_EQ(Feed(scene.Jpeg(), &after), MD_NO_MOTION)
        << "after a bad frame of " << frame.size() << " bytes";
    EXPECT_EQ(after, 0);
  }
}

TEST_P(MdEngineTest, PictureBeyondTheLargestSizeIsRefused) {
  Scene scene(Options(15));
  Reference(scene);
  std::string frame = scene.Jpeg();
  // Make the frame header (SOF0: FF C0, length, precision, height, width) claim 20000x20000.
  size_t sof = frame.find("\xFF\xC0");
  ASSERT_NE(sof, std::string::npos);
  frame[sof + 5] = frame[sof + 7] = static_cast<char>(20000 >> 8);
  frame[sof + 6] = frame[sof + 8] = static_cast<char>(20000 & 255);
  int level = -1;
  EXPECT_EQ(Feed(frame, &level), MD_ERR_SIZE);
  EXPECT_EQ(Feed(scene.Jpeg(), &level), MD_NO_MOTION);
}

TEST_P(MdEngineTest, RangesAreCheckedAndAtLeastSixteenAreKept) {
  const MD_RECT empty = {100, 100, 100, 200, 0};
  const MD_RECT inverted = {500, 900, 100, 700, 0};
  EXPECT_EQ(MD_SetDetectRange(&state_, &empty), MD_ERR_ARGUMENT);
  EXPECT_EQ(MD_SetDetectRange(&state_, &inverted), MD_ERR_ARGUMENT);
  EXPECT_EQ(MD_SetDetectRange(&state_, nullptr), MD_ERR_ARGUMENT);
  int accepted = 0;
  for (int i = 0; i < MD_MAX_RANGES + 4; ++i) {
    const MD_RECT r = {i * 100, i * 100, i * 100 + 50, i * 100 + 50, 0};
    if (MD_SetDetectRange(&state_, &r) == MD_OK) ++accepted;
  }
  EXPECT_GE(accepted, 16);
  EXPECT_EQ(accepted, MD_MAX_RANGES);
  // A range given again (a detector that restarts adds its ranges once more) is no new one.
  const MD_RECT again = {0, 0, 50, 50, 0};
  EXPECT_EQ(MD_SetDetectRange(&state_, &again), MD_OK);
  const MD_RECT another = {0, 0, 60, 60, 0};
  EXPECT_EQ(MD_SetDetectRange(&state_, &another), MD_ERR_RANGES);
}

TEST_P(MdEngineTest, RangeBeyondTheFrameIsClipped) {
  MD_SetMDThreshold(&state_, 1);
  const MD_RECT beyond = {-500, -500, 20000, 20000, 0};
  ASSERT_EQ(MD_SetDetectRange(&state_, &beyond), MD_OK);
  Scene scene(Options(16));
  scene.AddObject(Mover(0.5, 0.5, 0.3));
  Reference(scene);
  for (const Reading& r : Run(scene, 3)) EXPECT_EQ(r.result, MD_MOTION);
}

INSTANTIATE_TEST_SUITE_P(FastAndNormal, MdEngineTest, ::testing::Values(true, false),
                         [](const ::testing::TestParamInfo<bool>& info) {
                           return info.param ? "Fast" : "Normal";
                         });

}  // namespace
