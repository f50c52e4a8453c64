// The synthetic scene: deterministic frames, objects that move with Step(), brightness, and
// JPEG frames of the scene's size.

#include "sim/scene/scene.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "framework/host/jpegsrc.h"

namespace evsim {
namespace {

SceneOptions Small(double noise = 0.0) {
  SceneOptions o;
  o.width = 64;
  o.height = 48;
  o.noise = noise;
  o.seed = 3;
  return o;
}

TEST(SceneTest, SameSeedGivesTheSameFrames) {
  Scene a(Small(4.0)), b(Small(4.0));
  EXPECT_EQ(a.Render(), b.Render());
  EXPECT_EQ(a.Jpeg(), b.Jpeg());
  SceneOptions other = Small(4.0);
  other.seed = 4;
  Scene c(other);
  EXPECT_NE(Scene(Small(4.0)).Render(), c.Render());
}

TEST(SceneTest, NoiseChangesEveryFrameAndNothingElseDoes) {
  Scene still(Small(0.0));
  const std::vector<uint8_t> first = still.Render();
  EXPECT_EQ(still.Render(), first);
  Scene noisy(Small(5.0));
  const std::vector<uint8_t> one = noisy.Render();
  const std::vector<uint8_t> two = noisy.Render();
  ASSERT_EQ(one.size(), 64u * 48u * 3u);
  long sum = 0;
  int differing = 0;
  for (size_t i = 0; i < one.size(); ++i) {
    sum += std::abs(one[i] - two[i]);
    differing += one[i] != two[i];
  }
  EXPECT_GT(differing, static_cast<int>(one.size() / 2));
  EXPECT_LT(static_cast<double>(sum) / one.size(), 10.0);  // about 5 * sqrt(2) * 0.8
}

TEST(SceneTest, ObjectsMoveWithStepAndBounceAtTheEdges) {
  Scene scene(Small());
  SceneObject o;
  o.x = 0.7;
  o.y = 0.5;
  o.width = o.height = 0.25;
  o.dx = 0.1;
  const int k = scene.AddObject(o);
  const std::vector<uint8_t> before = scene.Render();
  scene.Step();
  EXPECT_DOUBLE_EQ(scene.Object(k).x, 0.75);  // 0.8 would leave the frame: back to the edge
  EXPECT_LT(scene.Object(k).dx, 0);
  EXPECT_NE(scene.Render(), before);
  scene.Object(k).dx = 0;
  const std::vector<uint8_t> stopped = scene.Render();
  scene.Step();
  EXPECT_EQ(scene.Render(), stopped);
}

TEST(SceneTest, BrightnessScalesEveryLevel) {
  Scene scene(Small());
  const std::vector<uint8_t> normal = scene.Render();
  scene.SetBrightness(0.5, 10);
  const std::vector<uint8_t> dim = scene.Render();
  for (size_t i = 0; i < normal.size(); ++i) {
    ASSERT_NEAR(dim[i], normal[i] * 0.5 + 10, 1.0) << i;
  }
}

TEST(SceneTest, JpegIsAFrameOfTheScenesSize) {
  Scene scene(Small(2.0));
  const std::string jpeg = scene.Jpeg();
  ASSERT_GT(jpeg.size(), 100u);
  JpegErrorJump error;
  jpeg_decompress_struct cinfo;
  SetJpegExit(&cinfo, &error);
  if (setjmp(error.jump) != 0) {
    jpeg_destroy_decompress(&cinfo);
    FAIL() << "the frame does not parse";
  }
  jpeg_CreateDecompress(&cinfo, JPEG_LIB_VERSION, sizeof(cinfo));
  JpegMemSrc(&cinfo, reinterpret_cast<const unsigned char*>(jpeg.data()), jpeg.size());
  jpeg_read_header(&cinfo, TRUE);
  const unsigned width = cinfo.image_width, height = cinfo.image_height;
  const int components = cinfo.num_components;
  jpeg_destroy_decompress(&cinfo);
  EXPECT_EQ(width, 64u);
  EXPECT_EQ(height, 48u);
  EXPECT_EQ(components, 3);
}

}  // namespace
}  // namespace evsim
