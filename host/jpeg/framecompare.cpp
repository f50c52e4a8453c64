#include "host/jpeg/framecompare.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <utility>

namespace {

// Gain is estimated in log2 steps of 1/64 over 1/4..4; cells near black or white say
// little about it (clipping, and large relative noise when dark).
constexpr int kGainBins = 256;
constexpr int kGainStepsPerOctave = 64;
constexpr int kGainLow = 16;
constexpr int kGainHigh = 240;
// A gain needs this share of the cells in range; otherwise the frame keeps gain 1.
constexpr int kGainMinShareDivisor = 4;
// Noise is taken as 1.4826 x the median absolute residual (the Gaussian consistency
// constant), and a difference counts from three times that; above kNoiseCap the frame is
// more likely dominated by change than by noise.
constexpr int kNoiseFactor = 3;
constexpr int kNoiseCap = 40;
constexpr int kAdaptShift = 2;  // the reference moves 1/4 of the way per unchanged frame
// A cell moved by d levels by the brightness change gets d / kShiftTolerance more tolerance.
constexpr int kShiftTolerance = 2;
// A region of changed cells is moving when at least this many of its cells changed since
// the previous frame.
constexpr int kLiveMovingCells = 2;
// The frame's gain, offset and noise are medians over about this many cells, taken evenly.
constexpr int kStatisticCells = 1024;

// Bin of log2(frame / reference) for every pair of luminance values.
class GainBins {
 public:
  GainBins() {
    for (int f = 0; f < 256; ++f) {
      for (int r = 0; r < 256; ++r) {
        int bin = kGainBins / 2;
        if (f > 0 && r > 0) {
          double steps = std::log2(static_cast<double>(f) / r) * kGainStepsPerOctave;
          bin = static_cast<int>(std::lround(steps)) + kGainBins / 2;
        }
        table_[f * 256 + r] = static_cast<uint8_t>(std::clamp(bin, 0, kGainBins - 1));
      }
    }
  }
  uint8_t operator()(int frame, int reference) const { return table_[frame * 256 + reference]; }

 private:
  std::array<uint8_t, 256 * 256> table_;
};

const GainBins& Bins() {
  static const GainBins bins;
  return bins;
}

// Index of the median entry of a histogram of `count` entries.
template <size_t N>
int Median(const std::array<int, N>& histogram, int count) {
  const int half = (count + 1) / 2;
  int seen = 0;
  for (size_t i = 0; i < N; ++i) {
    seen += histogram[i];
    if (seen >= half) return static_cast<int>(i);
  }
  return static_cast<int>(N) - 1;
}

// The reference as the frame's brightness would show it, 8.8 fixed point: gain (x.8)
// times reference (8.8), plus the offset.
int Predicted88(int reference, int gain_q8, int offset) {
  return std::clamp(((reference * gain_q8 + (1 << 7)) >> 8) + offset * 256, 0, 255 * 256);
}

// The same without the offset, in whole levels.
int Predicted8(int reference, int gain_q8) {
  return (Predicted88(reference, gain_q8, 0) + (1 << 7)) >> 8;
}

// Every step-th cell: the frame's statistics need a few thousand cells, not all of them.
int SampleStep(size_t cells) { return static_cast<int>(cells / kStatisticCells) | 1; }

}  // namespace

void FrameComparator::Reset(const uint8_t* frame, int width, int height) {
  const size_t cells = static_cast<size_t>(width) * height;
  if (width != width_ || height != height_) {
    width_ = height_ = 0;  // stays without a reference if an allocation throws
    reference_.resize(cells);
    previous_.resize(cells);
    mask_.resize(cells);
    cells_.assign(static_cast<size_t>(width + 2) * (height + 2), 0);
    queue_.resize(cells);
    row_above_.resize(static_cast<size_t>(height));
    mask_dirty_ = true;
  }
  for (size_t i = 0; i < cells; ++i) reference_[i] = static_cast<uint16_t>(frame[i] << 8);
  std::memcpy(previous_.data(), frame, cells);
  width_ = width;
  height_ = height;
}

void FrameComparator::SetRanges(std::vector<WatchRange> ranges) {
  ranges_ = std::move(ranges);
  mask_dirty_ = true;
}

void FrameComparator::BuildMask() {
  const int64_t w = width_, h = height_;
  watched_ = 0;
  for (int64_t y = 0; y < h; ++y) {
    for (int64_t x = 0; x < w; ++x) {
      bool in = ranges_.empty();
      for (const WatchRange& r : ranges_) {
        // The cell spans [x, x + 1) / w of the frame; it is watched when that span and the
        // range's overlap with a positive length on both axes.
        if (x * 10000 < r.right * w && (x + 1) * 10000 > r.left * w && y * 10000 < r.bottom * h &&
            (y + 1) * 10000 > r.top * h) {
          in = true;
          break;
        }
      }
      mask_[static_cast<size_t>(y * w + x)] = in ? 1 : 0;
      watched_ += in ? 1 : 0;
    }
  }
  mask_dirty_ = false;
}

int FrameComparator::EstimateGain(const uint8_t* frame, int step) const {
  const GainBins& bins = Bins();
  std::array<int, kGainBins> histogram{};
  const size_t cells = reference_.size();
  int used = 0, seen = 0;
  for (size_t i = 0; i < cells; i += step, ++seen) {
    const int f = frame[i], r = reference_[i] >> 8;
    if (f < kGainLow || f > kGainHigh || r < kGainLow || r > kGainHigh) continue;
    ++histogram[bins(f, r)];
    ++used;
  }
  if (used == 0 || used < seen / kGainMinShareDivisor) return 256;
  const int bin = Median(histogram, used);
  const double gain = std::exp2(static_cast<double>(bin - kGainBins / 2) / kGainStepsPerOctave);
  return static_cast<int>(std::lround(gain * 256));
}

void FrameComparator::EstimateOffsetAndNoise(const uint8_t* frame, int gain_q8, int step,
                                             int* offset, int* noise) const {
  const size_t cells = reference_.size();
  std::array<int, 511> offsets{};
  int seen = 0;
  for (size_t i = 0; i < cells; i += step, ++seen) {
    ++offsets[frame[i] - Predicted8(reference_[i], gain_q8) + 255];
  }
  *offset = Median(offsets, seen) - 255;
  std::array<int, 256> deviations{};
  for (size_t i = 0; i < cells; i += step) {
    ++deviations[std::min(255, std::abs(frame[i] - Predicted8(reference_[i], gain_q8) - *offset))];
  }
  const int mad = Median(deviations, seen);
  *noise = (mad * 14826 + 9999) / 10000;
}

void FrameComparator::Classify(const uint8_t* frame, int gain_q8, int offset, int threshold) {
  const int w = width_;
  const uint16_t* __restrict reference = reference_.data();
  const uint8_t* __restrict previous = previous_.data();
  for (int y = 0; y < height_; ++y) {
    const size_t row = static_cast<size_t>(y) * w;
    const uint8_t* __restrict now = frame + row;
    const uint16_t* __restrict ref = reference + row;
    const uint8_t* __restrict prev = previous + row;
    uint8_t* __restrict cell = &cells_[static_cast<size_t>(y + 1) * (w + 2) + 1];
    uint8_t any = 0;
    // Branch-free, so that the compiler can do many cells at once.
    for (int x = 0; x < w; ++x) {
      const int f = now[x];
      const int expected = Predicted8(ref[x], gain_q8) + offset;
      // A cell that the brightness change moved far is compared with more tolerance: its
      // colour channels clip one by one, which luminance alone cannot predict.
      const int t = threshold + std::abs(expected - (ref[x] >> 8)) / kShiftTolerance;
      // The previous frame as this frame's brightness would show it.
      const int before = std::clamp(((prev[x] * gain_q8 + 128) >> 8) + offset, 0, 255);
      const int a = std::abs(f - expected);
      const int m = std::abs(f - before);
      const uint8_t flags = static_cast<uint8_t>((a > t ? kAbove : 0) | (a > 2 * t ? kStrong : 0) |
                                                 (m > t ? kMoving : 0));
      cell[x] = flags;
      any |= flags;
    }
    row_above_[static_cast<size_t>(y)] = any & kAbove;
  }
}

inline bool FrameComparator::Changed(int at) const {
  const int stride = width_ + 2;
  // A cell just above the threshold counts only beside another one: noise comes alone.
  return (cells_[at] & kStrong) != 0 ||
         ((cells_[at] & kAbove) != 0 &&
          ((cells_[at - 1] | cells_[at + 1] | cells_[at - stride] | cells_[at + stride]) &
           kAbove) != 0);
}

void FrameComparator::MarkLive() {
  const int stride = width_ + 2;
  const int offsets[4] = {-1, 1, -stride, stride};
  for (int y = 0; y < height_; ++y) {
    if (row_above_[static_cast<size_t>(y)] == 0) continue;  // nothing changed in this row
    const int first = (y + 1) * stride + 1;
    for (int seed = first; seed < first + width_; ++seed) {
      if ((cells_[seed] & (kAbove | kVisited)) != kAbove || !Changed(seed)) continue;
      // One region of changed cells, breadth first; the border of zeros ends every walk.
      size_t end = 0;
      queue_[end++] = seed;
      cells_[seed] |= kVisited;
      int moving = 0;
      for (size_t head = 0; head < end; ++head) {
        const int at = queue_[head];
        if ((cells_[at] & kMoving) != 0) ++moving;
        for (int d : offsets) {
          const int next = at + d;
          if ((cells_[next] & (kAbove | kVisited)) == kAbove && Changed(next)) {
            cells_[next] |= kVisited;
            queue_[end++] = next;
          }
        }
      }
      if (moving < kLiveMovingCells) continue;
      for (size_t k = 0; k < end; ++k) cells_[queue_[k]] |= kLive;
    }
  }
}

int FrameComparator::CountAndAdapt(const uint8_t* frame, int gain_q8, int offset, int threshold) {
  const int w = width_, stride = w + 2;
  int changed = 0;
  for (int y = 0; y < height_; ++y) {
    const size_t row = static_cast<size_t>(y) * w;
    const uint8_t* __restrict now = frame + row;
    uint16_t* __restrict ref = reference_.data() + row;
    const uint8_t* __restrict mask = mask_.data() + row;
    const uint8_t* __restrict cell = &cells_[static_cast<size_t>(y + 1) * stride + 1];
    // Branch-free, so that the compiler can do many cells at once.
    for (int x = 0; x < w; ++x) {
      const int f = now[x] << 8;
      const int r = ref[x];
      // The reference follows a global change of brightness at once, and what happens in
      // the cell slowly.
      const int base = Predicted88(r, gain_q8, offset);
      const int flags = cell[x];
      // Where the brightness change moved the cell, what remains between the model and the
      // frame is the model's error (clipping, the camera's curve): take the frame.
      const bool moved = std::abs(base - r) >> 8 > threshold / 2;
      const int unchanged = moved ? f : base + (f - base) / (1 << kAdaptShift);
      const int live = (flags & kLive) != 0 ? 1 : 0;
      // Different from the reference but nothing in its region moves: what was there has
      // stopped, or the light changed there. It is the background now.
      const bool stopped = (flags & (kLive | kMoving)) == 0;
      const int changing = stopped ? f : base;
      ref[x] = static_cast<uint16_t>((flags & kAbove) == 0 ? unchanged : changing);
      changed += live * mask[x];
    }
  }
  std::memcpy(previous_.data(), frame, reference_.size());
  return changed;
}

int FrameComparator::Compare(const uint8_t* frame) {
  if (mask_dirty_) BuildMask();
  const int step = SampleStep(reference_.size());
  const int gain_q8 = EstimateGain(frame, step);
  int offset = 0, noise = 0;
  EstimateOffsetAndNoise(frame, gain_q8, step, &offset, &noise);
  const int threshold = std::max(difference_, std::min(kNoiseCap, kNoiseFactor * noise));

  Classify(frame, gain_q8, offset, threshold);
  MarkLive();
  const int changed = CountAndAdapt(frame, gain_q8, offset, threshold);

  stats_ = Stats{gain_q8, offset, noise, threshold, changed, watched_};
  if (watched_ == 0) return 0;
  return static_cast<int>((static_cast<int64_t>(changed) * 200 + watched_) / (2 * watched_));
}
