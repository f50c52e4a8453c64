// The host's motion engine: finds motion by comparing the JPEG frames of one camera.
//
// The state is an MD_DETECTION that the caller owns; MD_CreateDetection sets it up and
// MD_FinishDetection releases what it holds. Each frame is decoded only as far as needed:
// luminance only, at 1/8 of its size in fast mode (the DC coefficients alone give the
// picture) or at 1/4 otherwise. Every pixel of that small picture is a cell; see
// host/jpeg/framecompare.h for how cells are compared with the reference and why a
// change of brightness, noise or something that stopped moving is not motion.
//
// Settings:
//   sensitivity 0..100 (default 90): how small a change of a cell's brightness counts. A
//     cell counts as changed when it differs from the reference, after global brightness
//     is compensated, by more than 3 + (100 - sensitivity) * 97 / 100 luminance levels
//     (of 255): 3 at 100, 12 at 90, 51 at 50, 100 at 0; never less than three times the
//     frame's own noise.
//   threshold 0..100 (default 10): the level, in percent of the watched area, from which a
//     frame is motion.
//   ranges: the watched area, rectangles in the 0..10000 space of the frame (10000 = the
//     full width or height); up to MD_MAX_RANGES; the whole frame while none is set.
//   fast mode (default off): 1/8 scale instead of 1/4: coarser cells, and the picture
//     comes from the DC coefficients alone, which host/jpeg/dcluma.h reads without
//     decoding the rest; about half the work of normal mode.
//
// Threads: one state belongs to one thread at a time; different states are independent.
// The functions never throw. After the first frames of a size and of a set of Huffman
// tables the engine allocates nothing (libjpeg still takes its per-picture working memory
// from its own pool).

#ifndef EVWATCH_FRAMEWORK_HOST_MDENGINE_H_
#define EVWATCH_FRAMEWORK_HOST_MDENGINE_H_

#include <cstdint>

// A watched rectangle, in this word order (the last word is 0).
struct _tag_MD_RECT {
  int32_t top;
  int32_t left;
  int32_t right;
  int32_t bottom;
  int32_t reserved;
};
typedef _tag_MD_RECT MD_RECT;

// The engine state: set up by MD_CreateDetection, released by MD_FinishDetection.
struct _tag_MD_DETECTION {
  void* engine;  // the engine's working memory; null when not set up
};
typedef _tag_MD_DETECTION MD_DETECTION;

// Results of MD_DetectMotionSeq. The setters and getters return MD_OK or an error (> 0).
constexpr int MD_OK = 0;
constexpr int MD_ERR_ARGUMENT = 1;  // null state, state not set up, value out of range
constexpr int MD_ERR_MEMORY = 2;    // no memory for the engine or a frame
constexpr int MD_MOTION = 3;        // the level reached the threshold
constexpr int MD_NO_MOTION = 4;     // it did not
constexpr int MD_ERR_DECODE = 5;    // the frame is not a JPEG that decodes cleanly
constexpr int MD_ERR_SIZE = 6;      // the frame's picture is larger than kMaxDimension
constexpr int MD_ERR_RANGES = 7;    // MD_MAX_RANGES ranges are set already
constexpr int MD_REFERENCE = 8;     // the frame became the reference: no motion

constexpr int MD_MAX_RANGES = 32;
constexpr int MD_MAX_DIMENSION = 16384;  // largest picture width or height decoded

// Sets up `state` (sensitivity 90, threshold 10, fast mode off, no ranges). MD_OK, or
// MD_ERR_ARGUMENT / MD_ERR_MEMORY. REQUIRES: state is not set up (or was finished).
int MD_CreateDetection(MD_DETECTION* state);
// Releases what the state holds; it may be set up again. MD_OK, or MD_ERR_ARGUMENT.
int MD_FinishDetection(MD_DETECTION* state);

// MD_ERR_ARGUMENT (and no change) for a value outside 0..100.
int MD_SetMDSensitivity(MD_DETECTION* state, int sensitivity);
int MD_SetMDThreshold(MD_DETECTION* state, int threshold);
int MD_GetMDSensitivity(MD_DETECTION* state, int* sensitivity);
int MD_GetMDThreshold(MD_DETECTION* state, int* threshold);
// Non-zero `enable` selects fast mode. The next frame becomes the reference.
int MD_EnableFastMD(MD_DETECTION* state, int enable);

// Adds a watched range. Coordinates outside 0..10000 are clipped; a range with no area
// after that is refused with MD_ERR_ARGUMENT; a range equal to one already set is accepted
// and changes nothing.
int MD_SetDetectRange(MD_DETECTION* state, const MD_RECT* range);

// Feeds the next frame of the sequence: `length` bytes of JPEG at `data`.
//   data null: resets the sequence (the next frame becomes the reference); MD_OK.
//   the first frame after a reset, or a frame whose picture size differs from the
//     reference's: it becomes the reference; MD_REFERENCE, *level 0.
//   a frame that does not decode cleanly (corrupt, truncated, not a JPEG): MD_ERR_DECODE;
//     MD_ERR_SIZE for a picture beyond MD_MAX_DIMENSION. The reference is kept, so the
//     next good frame is compared with it.
//   otherwise *level := percentage (0..100) of the watched area that changed, and
//     MD_MOTION when it reached the threshold, else MD_NO_MOTION.
// `level` may be null; it is written only when a frame was judged or became the reference.
int MD_DetectMotionSeq(MD_DETECTION* state, const char* data, int length, int* level);

#endif  // EVWATCH_FRAMEWORK_HOST_MDENGINE_H_
