// The image half of the motion engine: compares luminance frames of one size, cell by cell,
// against a reference that adapts slowly, and gives the share of the watched cells that
// belong to something moving. A cell is one pixel of the small frame the engine decodes
// (the mean of an 8x8 or 4x4 block of the camera's picture).
//
// A cell has changed when it differs from the reference by more than the threshold: the
// larger of the configured difference and three times the frame's robust noise estimate
// (1.48 times the median absolute residual). A cell just above the threshold counts only
// beside another one; noise comes alone. Changed cells that touch form a region; a region
// counts when at least two of its cells also changed since the previous frame, so a body
// whose inside looks still counts as long as its edges move.
//
// What does not count:
//   - a global change of brightness (a light switched on, auto-exposure): each frame the
//     median gain and then the median offset between the frame and the reference are
//     taken out before cells are compared; cells that change moves far get more tolerance
//     (their colour channels clip one by one), and the reference follows such a change at
//     once;
//   - what stopped moving, or light that changed in one place: a region of which nothing
//     moves is taken into the reference at once;
//   - slow drift: cells that did not change pull the reference a quarter of the way
//     towards them per frame.
//
// Buffers are sized by Reset() when the frame size changes; Compare() allocates nothing.
// An object belongs to one thread at a time; it is movable, not copyable.

#ifndef EVWATCH_HOST_JPEG_FRAMECOMPARE_H_
#define EVWATCH_HOST_JPEG_FRAMECOMPARE_H_

#include <cstdint>
#include <vector>

// A watched rectangle in the 0..10000 space of the frame on each axis.
struct WatchRange {
  int left, top, right, bottom;
};

class FrameComparator {
 public:
  FrameComparator() = default;
  FrameComparator(const FrameComparator&) = delete;
  FrameComparator& operator=(const FrameComparator&) = delete;
  FrameComparator(FrameComparator&&) = default;
  FrameComparator& operator=(FrameComparator&&) = default;

  // Starts a new sequence with `frame` (width x height bytes, rows without padding) as the
  // reference. REQUIRES: width, height > 0. May throw std::bad_alloc when the size is new.
  void Reset(const uint8_t* frame, int width, int height);
  // Whether Reset() has set a reference of this size.
  bool HasReference(int width, int height) const {
    return width == width_ && height == height_ && width_ > 0;
  }
  // Forgets the reference: HasReference() is false until the next Reset().
  void Forget() { width_ = height_ = 0; }

  // Percentage (0..100, rounded to the nearest) of the watched cells of `frame` that
  // changed, and the reference adapted to it.
  // REQUIRES: HasReference() for the frame's size.
  int Compare(const uint8_t* frame);

  // Smallest luminance difference (0..255) of a cell that counts as change.
  void SetDifference(int levels) { difference_ = levels; }
  int Difference() const { return difference_; }
  // The watched area: the union of the ranges; every cell when there are none. A cell is
  // watched when its area overlaps a range.
  void SetRanges(std::vector<WatchRange> ranges);

  // Measurements of the last Compare(), for tests.
  struct Stats {
    int gain_q8 = 256;  // frame / reference gain, 8 fractional bits
    int offset = 0;     // luminance offset taken out after the gain
    int noise = 0;      // robust noise estimate, luminance levels
    int threshold = 0;  // difference that counted as change
    int changed = 0;    // watched cells that changed
    int watched = 0;    // watched cells
  };
  const Stats& LastStats() const { return stats_; }

 private:
  // Flags of a cell in cells_.
  enum : uint8_t {
    kAbove = 1,    // differs from the reference by more than the threshold
    kStrong = 2,   // ... by more than twice the threshold
    kMoving = 4,   // differs from the previous frame by more than the threshold
    kVisited = 8,  // reached by the region walk of this frame
    kLive = 16,    // in a region of changed cells of which some are moving
  };

  void BuildMask();
  int EstimateGain(const uint8_t* frame, int step) const;
  void EstimateOffsetAndNoise(const uint8_t* frame, int gain_q8, int step, int* offset,
                              int* noise) const;
  void Classify(const uint8_t* frame, int gain_q8, int offset, int threshold);
  // Whether the cell at cells_ index `at` has changed: kStrong, or kAbove beside kAbove.
  bool Changed(int at) const;
  void MarkLive();
  int CountAndAdapt(const uint8_t* frame, int gain_q8, int offset, int threshold);

  int width_ = 0;  // frame size of the reference; 0 when there is none
  int height_ = 0;
  int difference_ = 12;     // configured smallest difference that counts
  bool mask_dirty_ = true;  // ranges changed since the mask was built
  int watched_ = 0;         // cells set in mask_
  std::vector<WatchRange> ranges_;
  std::vector<uint16_t> reference_;  // 8.8 fixed point luminance per cell
  std::vector<uint8_t> previous_;    // the last frame
  std::vector<uint8_t> mask_;        // 1 for a watched cell
  // Flags per cell, with a border of zeros one cell wide so that neighbours need no bounds
  // checks (index (y + 1) * (width + 2) + x + 1).
  std::vector<uint8_t> cells_;
  std::vector<int> queue_;          // cells_ indexes of the region being walked
  std::vector<uint8_t> row_above_;  // per row: kAbove when any of its cells has it
  Stats stats_;
};

#endif  // EVWATCH_HOST_JPEG_FRAMECOMPARE_H_
