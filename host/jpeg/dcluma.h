// A JPEG frame's luminance at 1/8 of its size, read straight from the DC coefficients.
//
// At 1/8 scale each 8x8 block of the picture becomes one pixel, the block's mean, which is
// its DC coefficient. A general decoder still decodes every AC coefficient to find where
// the next block starts, and that entropy decoding is nearly all of the cost. This decoder
// only measures the AC coefficients, with tables that take a Huffman code and its value
// bits in one step, and skips the chroma blocks the same way; its output is byte for byte
// what libjpeg-turbo gives for the frame at scale 1/8 in JCS_GRAYSCALE.
//
// It takes the common camera frame: sequential Huffman coding, 8-bit samples, one scan
// holding every component (YCbCr or grey) with the luminance at full sampling, with or
// without restart markers. For anything else, or data that are not clean (a code that is
// not in the table, a marker too early, anything but EOI after the scan), Decode() returns
// false and the caller decodes the frame with the library, which has the last word on
// damaged data.
//
// Huffman tables: making a table ready costs about as much as decoding a small frame, so
// a table is made when it comes in two frames in a row, and kept. Until then, and for a
// camera that changes its tables at every frame, Decode() returns false and the library
// decodes. A camera's frames normally repeat their tables: from its second frame on, each
// costs no set-up. Memory: about 35 KiB per AC table made (one per table slot in use,
// usually two) and a few KiB besides.
//
// Threads: an object belongs to one thread at a time. Decode() does not throw; it
// allocates only when it makes a table.

#ifndef EVWATCH_HOST_JPEG_DCLUMA_H_
#define EVWATCH_HOST_JPEG_DCLUMA_H_

#include <cstdint>
#include <cstdio>
#include <memory>

#include <jpeglib.h>

class DcLumaDecoder {
 public:
  DcLumaDecoder();
  ~DcLumaDecoder();
  DcLumaDecoder(const DcLumaDecoder&) = delete;
  DcLumaDecoder& operator=(const DcLumaDecoder&) = delete;

  // Decodes the frame whose header `cinfo` has read: jpeg_read_header() done on a memory
  // source that holds the rest of the frame, jpeg_start_decompress() not called. Writes
  // width x height bytes to `out` (rows without padding), where width and height must be
  // the frame's size divided by 8 and rounded up. Leaves `cinfo` as it was.
  // False, with `out` in no particular state, when the frame is not one this decoder takes.
  bool Decode(const jpeg_decompress_struct& cinfo, uint8_t* out, int width, int height);

 private:
  struct Tables;
  std::unique_ptr<Tables> tables_;
};

#endif  // EVWATCH_HOST_JPEG_DCLUMA_H_
