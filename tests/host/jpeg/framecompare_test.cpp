#include "host/jpeg/framecompare.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

constexpr int kW = 20;
constexpr int kH = 10;

// A textured frame: levels 40..200 in a fixed pattern.
std::vector<uint8_t> Texture() {
  std::vector<uint8_t> f(kW * kH);
  for (int i = 0; i < kW * kH; ++i) f[i] = static_cast<uint8_t>(40 + (i * 37) % 161);
  return f;
}

TEST(FrameComparatorTest, WithoutRangesEveryCellIsWatched) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  EXPECT_EQ(c.Compare(f.data()), 0);
  EXPECT_EQ(c.LastStats().watched, kW * kH);
  EXPECT_EQ(c.LastStats().changed, 0);
}

TEST(FrameComparatorTest, CellsOverlappingARangeAreWatched) {
  FrameComparator c;
  // The left half exactly, and a sliver that touches the cells of row 9 only.
  c.SetRanges({{0, 0, 5000, 5000}, {9990, 9950, 10000, 10000}});
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  c.Compare(f.data());
  EXPECT_EQ(c.LastStats().watched, 10 * 5 + 1);
}

TEST(FrameComparatorTest, ChangedShareIsRoundedToTheNearestPercent) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> patch = f;
  // One 3x3 patch of strong change: 9 of 200 cells, 4.5%.
  for (int y = 2; y < 5; ++y) {
    for (int x = 2; x < 5; ++x)
      patch[y * kW + x] = static_cast<uint8_t>(f[y * kW + x] > 128 ? 0 : 255);
  }
  EXPECT_EQ(c.Compare(patch.data()), 5);
  EXPECT_EQ(c.LastStats().changed, 9);
  // 2 of 200 cells, 1%; then 1 of 200 (a lone cell, but part of a changing pair a frame
  // earlier) is no longer a region.
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> pair = f;
  pair[7 * kW + 10] = pair[7 * kW + 11] = 0;
  EXPECT_EQ(c.Compare(pair.data()), 1);
}

TEST(FrameComparatorTest, LoneChangedCellIsNoise) {
  FrameComparator c;
  c.SetDifference(10);
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> strong = f;
  strong[5 * kW + 5] = static_cast<uint8_t>(strong[5 * kW + 5] + 60);
  EXPECT_EQ(c.Compare(strong.data()), 0);
}

TEST(FrameComparatorTest, WeakChangeCountsOnlyBesideAnotherChange) {
  FrameComparator c;
  c.SetDifference(10);
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> apart = f;
  apart[2 * kW + 2] = static_cast<uint8_t>(apart[2 * kW + 2] + 15);
  apart[2 * kW + 4] = static_cast<uint8_t>(apart[2 * kW + 4] + 15);
  EXPECT_EQ(c.Compare(apart.data()), 0);
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> beside = f;
  beside[2 * kW + 2] = static_cast<uint8_t>(beside[2 * kW + 2] + 15);
  beside[2 * kW + 3] = static_cast<uint8_t>(beside[2 * kW + 3] + 15);
  EXPECT_EQ(c.Compare(beside.data()), 1);
  EXPECT_EQ(c.LastStats().changed, 2);
}

TEST(FrameComparatorTest, GlobalGainAndOffsetAreTakenOut) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  std::vector<uint8_t> brighter(f.size());
  for (size_t i = 0; i < f.size(); ++i) brighter[i] = static_cast<uint8_t>(f[i] * 5 / 4);
  EXPECT_EQ(c.Compare(brighter.data()), 0);
  EXPECT_NEAR(c.LastStats().gain_q8, 320, 4);
  std::vector<uint8_t> shifted(f.size());
  for (size_t i = 0; i < f.size(); ++i) shifted[i] = static_cast<uint8_t>(brighter[i] - 30);
  EXPECT_EQ(c.Compare(shifted.data()), 0);
  EXPECT_EQ(c.LastStats().changed, 0);
}

// A bright bar over the columns [from, to) of rows 3 and 4.
void Bar(std::vector<uint8_t>& f, int from, int to) {
  for (int x = from; x < to; ++x) f[3 * kW + x] = f[4 * kW + x] = 250;
}

TEST(FrameComparatorTest, ChangeThatStopsIsTakenIntoTheReferenceAtOnce) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  Bar(f, 0, 6);
  EXPECT_EQ(c.Compare(f.data()), 6);  // 12 of 200 cells appeared
  EXPECT_EQ(c.Compare(f.data()), 0);  // nothing in it moves: it is background now
  EXPECT_EQ(c.Compare(f.data()), 0);
}

TEST(FrameComparatorTest, StillCellsOfAMovingRegionCount) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  c.Reset(f.data(), kW, kH);
  Bar(f, 0, 6);
  c.Compare(f.data());
  // The bar grows by two columns: its first six columns are still, its new ones moving.
  Bar(f, 6, 8);
  EXPECT_EQ(c.Compare(f.data()), 8);
  EXPECT_EQ(c.LastStats().changed, 16);
}

TEST(FrameComparatorTest, ForgetDropsTheReference) {
  FrameComparator c;
  std::vector<uint8_t> f = Texture();
  EXPECT_FALSE(c.HasReference(kW, kH));
  c.Reset(f.data(), kW, kH);
  EXPECT_TRUE(c.HasReference(kW, kH));
  EXPECT_FALSE(c.HasReference(kW + 1, kH));
  c.Forget();
  EXPECT_FALSE(c.HasReference(kW, kH));
}

}  // namespace
