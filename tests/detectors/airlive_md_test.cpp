// AirliveV1MD against a fake camera that pushes motion data at motion/motiondata.cgi on the
// camera's own port, with numeric groups: the shared cases, then AirLive's own line format.

#include "detectors/airlive.h"

#include "tests/detectors/fixedmotiondata_cases.h"

namespace evtest {

struct AirliveStream {
  using Detector = AirliveV1MD;
  static constexpr const char* kPath = "/motion/motiondata.cgi";
  static std::string Line(int group, int level, int threshold) {
    return "group=" + std::to_string(group) + ";level=" + std::to_string(level) +
           ";threshold=" + std::to_string(threshold) + ";";
  }
};

INSTANTIATE_TYPED_TEST_SUITE_P(Airlive, FixedMotionDataTest, AirliveStream);

using AirliveV1MDTest = FixedMotionDataTest<AirliveStream>;

TEST_F(AirliveV1MDTest, NumericGroupsOfSeveralDigitsAreRead) {
  EXPECT_EQ(ReadOne("group=12;level=11;threshold=10;"), (MotionReading{0, true, 11}));
}

TEST_F(AirliveV1MDTest, LetterGroupDoesNotMatch) {
  EXPECT_EQ(ReadOne("group=a;level=60;threshold=50;"), (MotionReading{0, false, 0}));
}

}  // namespace evtest
