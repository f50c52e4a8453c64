#include "framework/host/mdengine.h"

#include <algorithm>
#include <csetjmp>
#include <new>
#include <vector>

#include "host/jpeg/dcluma.h"
#include "host/jpeg/framecompare.h"
#include "framework/host/jpegsrc.h"

namespace {

constexpr int kFastScale = 8;    // DC coefficients only
constexpr int kNormalScale = 4;  // 2x2 of each block's coefficients
constexpr int kRowBatch = 16;    // scanlines handed to the library per call
constexpr int kRangeSpace = 10000;

struct Engine {
  JpegErrorJump error;           // the decompressor's error exit; outlives it
  jpeg_decompress_struct cinfo;  // reused for every frame; valid once created
  int sensitivity = 90;
  int threshold = 10;
  bool fast = false;
  std::vector<MD_RECT> ranges;  // as set, clipped; at most MD_MAX_RANGES
  std::vector<uint8_t> luma;    // the decoded frame, output_width x output_height
  DcLumaDecoder dc_luma;        // fast mode's decoder for the common frame
  FrameComparator comparator;
};

Engine* Get(MD_DETECTION* state) {
  return state == nullptr ? nullptr : static_cast<Engine*>(state->engine);
}

int DifferenceFor(int sensitivity) { return 3 + (100 - sensitivity) * 97 / 100; }

// The library calls below long-jump back here on an error, so these functions hold no
// C++ objects of their own.
bool CreateDecompressor(Engine* e) {
  SetJpegExit(&e->cinfo, &e->error);
  if (setjmp(e->error.jump) != 0) {
    jpeg_destroy_decompress(&e->cinfo);
    return false;
  }
  jpeg_CreateDecompress(&e->cinfo, JPEG_LIB_VERSION, sizeof(e->cinfo));
  return true;
}

// Reads the frame's header and sets the decoding up: luminance at the mode's scale.
// MD_OK with the output size, or an error with the decompressor idle again.
int ReadHeader(Engine* e, const char* data, int length, int* width, int* height) {
  jpeg_decompress_struct* cinfo = &e->cinfo;
  e->error.mgr.num_warnings = 0;
  if (setjmp(e->error.jump) != 0) {
    jpeg_abort_decompress(cinfo);
    return MD_ERR_DECODE;
  }
  JpegMemSrc(cinfo, reinterpret_cast<const unsigned char*>(data),
             static_cast<unsigned long>(length));
  jpeg_read_header(cinfo, TRUE);
  if (cinfo->image_width > MD_MAX_DIMENSION || cinfo->image_height > MD_MAX_DIMENSION) {
    jpeg_abort_decompress(cinfo);
    return MD_ERR_SIZE;
  }
  cinfo->scale_num = 1;
  cinfo->scale_denom = e->fast ? kFastScale : kNormalScale;
  cinfo->out_color_space = JCS_GRAYSCALE;
  cinfo->do_fancy_upsampling = FALSE;
  cinfo->do_block_smoothing = FALSE;
  jpeg_calc_output_dimensions(cinfo);
  *width = static_cast<int>(cinfo->output_width);
  *height = static_cast<int>(cinfo->output_height);
  return MD_OK;
}

// Decodes the frame set up by ReadHeader into `out` (rows of `width` bytes). A frame that
// needed the library's warnings (corrupt or truncated data) does not count as decoded.
int DecodeRows(Engine* e, uint8_t* out, int width) {
  jpeg_decompress_struct* cinfo = &e->cinfo;
  if (setjmp(e->error.jump) != 0) {
    jpeg_abort_decompress(cinfo);
    return MD_ERR_DECODE;
  }
  jpeg_start_decompress(cinfo);
  JSAMPROW rows[kRowBatch];
  while (cinfo->output_scanline < cinfo->output_height) {
    const JDIMENSION first = cinfo->output_scanline;
    const JDIMENSION count = std::min<JDIMENSION>(kRowBatch, cinfo->output_height - first);
    for (JDIMENSION i = 0; i < count; ++i) {
      rows[i] = out + static_cast<size_t>(first + i) * static_cast<size_t>(width);
    }
    jpeg_read_scanlines(cinfo, rows, count);
  }
  // Reading on to the end of the frame finds corrupt entropy data that decoded without a
  // complaint: the decoder then stopped short of (or ran past) the end of its data.
  jpeg_finish_decompress(cinfo);
  return e->error.mgr.num_warnings == 0 ? MD_OK : MD_ERR_DECODE;
}

int Detect(Engine* e, const char* data, int length, int* level) {
  if (length <= 0) return MD_ERR_DECODE;
  int width = 0, height = 0;
  int result = ReadHeader(e, data, length, &width, &height);
  if (result != MD_OK) return result;
  const size_t cells = static_cast<size_t>(width) * static_cast<size_t>(height);
  if (e->luma.size() != cells) {
    try {
      e->luma.resize(cells);
    } catch (const std::bad_alloc&) {
      jpeg_abort_decompress(&e->cinfo);
      return MD_ERR_MEMORY;
    }
  }
  // Fast mode reads the common frame's DC coefficients itself; the library decodes the
  // rest, and has the last word on a damaged frame.
  if (e->fast && e->dc_luma.Decode(e->cinfo, e->luma.data(), width, height)) {
    jpeg_abort_decompress(&e->cinfo);
  } else {
    result = DecodeRows(e, e->luma.data(), width);
    if (result != MD_OK) return result;
  }

  if (!e->comparator.HasReference(width, height)) {
    try {
      e->comparator.Reset(e->luma.data(), width, height);
    } catch (const std::bad_alloc&) {
      return MD_ERR_MEMORY;
    }
    if (level != nullptr) *level = 0;
    return MD_REFERENCE;
  }
  const int changed = e->comparator.Compare(e->luma.data());
  if (level != nullptr) *level = changed;
  return changed >= e->threshold ? MD_MOTION : MD_NO_MOTION;
}

void ApplyRanges(Engine* e) {
  std::vector<WatchRange> ranges;
  ranges.reserve(e->ranges.size());
  for (const MD_RECT& r : e->ranges) ranges.push_back(WatchRange{r.left, r.top, r.right, r.bottom});
  e->comparator.SetRanges(std::move(ranges));
}

}  // namespace

int MD_CreateDetection(MD_DETECTION* state) {
  if (state == nullptr) return MD_ERR_ARGUMENT;
  state->engine = nullptr;
  Engine* e = new (std::nothrow) Engine;
  if (e == nullptr) return MD_ERR_MEMORY;
  try {
    e->ranges.reserve(MD_MAX_RANGES);
  } catch (const std::bad_alloc&) {
    delete e;
    return MD_ERR_MEMORY;
  }
  if (!CreateDecompressor(e)) {
    delete e;
    return MD_ERR_MEMORY;
  }
  e->comparator.SetDifference(DifferenceFor(e->sensitivity));
  state->engine = e;
  return MD_OK;
}

int MD_FinishDetection(MD_DETECTION* state) {
  Engine* e = Get(state);
  if (e == nullptr) return MD_ERR_ARGUMENT;
  jpeg_destroy_decompress(&e->cinfo);
  delete e;
  state->engine = nullptr;
  return MD_OK;
}

int MD_SetMDSensitivity(MD_DETECTION* state, int sensitivity) {
  Engine* e = Get(state);
  if (e == nullptr || sensitivity < 0 || sensitivity > 100) return MD_ERR_ARGUMENT;
  e->sensitivity = sensitivity;
  e->comparator.SetDifference(DifferenceFor(sensitivity));
  return MD_OK;
}

int MD_SetMDThreshold(MD_DETECTION* state, int threshold) {
  Engine* e = Get(state);
  if (e == nullptr || threshold < 0 || threshold > 100) return MD_ERR_ARGUMENT;
  e->threshold = threshold;
  return MD_OK;
}

int MD_GetMDSensitivity(MD_DETECTION* state, int* sensitivity) {
  Engine* e = Get(state);
  if (e == nullptr || sensitivity == nullptr) return MD_ERR_ARGUMENT;
  *sensitivity = e->sensitivity;
  return MD_OK;
}

int MD_GetMDThreshold(MD_DETECTION* state, int* threshold) {
  Engine* e = Get(state);
  if (e == nullptr || threshold == nullptr) return MD_ERR_ARGUMENT;
  *threshold = e->threshold;
  return MD_OK;
}

int MD_EnableFastMD(MD_DETECTION* state, int enable) {
  Engine* e = Get(state);
  if (e == nullptr) return MD_ERR_ARGUMENT;
  const bool fast = enable != 0;
  if (fast != e->fast) e->comparator.Forget();
  e->fast = fast;
  return MD_OK;
}

int MD_SetDetectRange(MD_DETECTION* state, const MD_RECT* range) {
  Engine* e = Get(state);
  if (e == nullptr || range == nullptr) return MD_ERR_ARGUMENT;
  MD_RECT r = *range;
  r.top = std::clamp(r.top, 0, kRangeSpace);
  r.left = std::clamp(r.left, 0, kRangeSpace);
  r.right = std::clamp(r.right, 0, kRangeSpace);
  r.bottom = std::clamp(r.bottom, 0, kRangeSpace);
  r.reserved = 0;
  if (r.right <= r.left || r.bottom <= r.top) return MD_ERR_ARGUMENT;
  for (const MD_RECT& known : e->ranges) {
    if (known.top == r.top && known.left == r.left && known.right == r.right &&
        known.bottom == r.bottom) {
      return MD_OK;  // a detector that restarts adds its ranges again
    }
  }
  if (static_cast<int>(e->ranges.size()) >= MD_MAX_RANGES) return MD_ERR_RANGES;
  e->ranges.push_back(r);  // capacity reserved at creation
  try {
    ApplyRanges(e);
  } catch (const std::bad_alloc&) {
    e->ranges.pop_back();
    return MD_ERR_MEMORY;
  }
  return MD_OK;
}

int MD_DetectMotionSeq(MD_DETECTION* state, const char* data, int length, int* level) {
  Engine* e = Get(state);
  if (e == nullptr) return MD_ERR_ARGUMENT;
  if (data == nullptr) {
    e->comparator.Forget();
    return MD_OK;
  }
  return Detect(e, data, length, level);
}
