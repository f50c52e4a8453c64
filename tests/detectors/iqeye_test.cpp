// IQeyeV2MD against a fake camera that pushes motion data at now.motiondata on the camera's
// own port, with numbered windows and no trailing semicolon: the shared cases, then IQeye's
// own line format.

#include "detectors/iqeye.h"

#include "tests/detectors/fixedmotiondata_cases.h"

namespace evtest {

struct IqeyeStream {
  using Detector = IQeyeV2MD;
  static constexpr const char* kPath = "/now.motiondata";
  static std::string Line(int window, int level, int threshold) {
    return "window=" + std::to_string(window) + ";level=" + std::to_string(level) +
           ";threshold=" + std::to_string(threshold);
  }
};

INSTANTIATE_TYPED_TEST_SUITE_P(Iqeye, FixedMotionDataTest, IqeyeStream);

using IQeyeV2MDTest = FixedMotionDataTest<IqeyeStream>;

TEST_F(IQeyeV2MDTest, GroupLinesDoNotMatch) {
  EXPECT_EQ(ReadOne("group=0;level=60;threshold=50;"), (MotionReading{0, false, 0}));
}

TEST_F(IQeyeV2MDTest, PartOf1025BytesIsReadWhole) {
  const std::string line = "window=3;level=70;threshold=50";
  std::string body(1025 - line.size(), '\n');
  EXPECT_EQ(ReadOne(body + line), (MotionReading{0, true, 70}));
}

}  // namespace evtest
