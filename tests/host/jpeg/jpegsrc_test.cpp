#include "framework/host/jpegsrc.h"

#include <gtest/gtest.h>
#include <jerror.h>

#include <csetjmp>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "sim/scene/mjpeg.h"

namespace {

using evsim::EncodeGreyJpeg;
using evsim::JpegSegment;
using evsim::kJpegApp0;
using evsim::kJpegCom;

// What one parse saw. Plain data: it lives in the caller's frame across the long jump.
struct Outcome {
  bool jumped;
  int error_code;          // the library's message code when it jumped
  unsigned width;
  unsigned height;
  unsigned saved_length;   // data length of the first saved COM segment, 0 when none
  unsigned char first_saved_byte;
  long warnings;
  unsigned rows_decoded;   // with decode: scanlines read
};

// Parses (and with `decode`, decodes) `length` bytes at `data`, saving COM segments. Holds
// no object with a destructor between setjmp and the library calls.
void Parse(const unsigned char* data, unsigned long length, bool decode, Outcome* out) {
  std::memset(out, 0, sizeof(*out));
  JpegErrorJump error;
  jpeg_decompress_struct cinfo;
  SetJpegExit(&cinfo, &error);
  if (setjmp(error.jump) != 0) {
    out->jumped = true;
    out->error_code = error.mgr.msg_code;
    jpeg_destroy_decompress(&cinfo);
    return;
  }
  jpeg_CreateDecompress(&cinfo, JPEG_LIB_VERSION, sizeof(cinfo));
  JpegMemSrc(&cinfo, data, length);
  jpeg_save_markers(&cinfo, JPEG_COM, 0xFFFF);
  jpeg_read_header(&cinfo, TRUE);
  out->width = cinfo.image_width;
  out->height = cinfo.image_height;
  if (cinfo.marker_list != nullptr) {
    out->saved_length = cinfo.marker_list->data_length;
    if (out->saved_length > 0) out->first_saved_byte = cinfo.marker_list->data[0];
  }
  if (decode) {
    jpeg_start_decompress(&cinfo);
    JSAMPLE row[4096];
    JSAMPROW rows[1] = {row};
    while (cinfo.output_scanline < cinfo.output_height && cinfo.output_width <= sizeof(row)) {
      out->rows_decoded += jpeg_read_scanlines(&cinfo, rows, 1);
    }
    jpeg_finish_decompress(&cinfo);
  }
  out->warnings = error.mgr.num_warnings;
  jpeg_destroy_decompress(&cinfo);
}

// Parses a copy of the bytes in a heap block of exactly their size, so that AddressSanitizer
// sees any read past the end.
Outcome ParseExact(const std::string& bytes, bool decode = false) {
  std::vector<unsigned char> exact(bytes.begin(), bytes.end());
  Outcome out;
  Parse(exact.empty() ? nullptr : exact.data(), exact.size(), decode, &out);
  return out;
}

std::string Frame() {
  return EncodeGreyJpeg(64, 48, 128, {JpegSegment{kJpegCom, "hello camera"}});
}

TEST(JpegSrcTest, ReadsHeaderAndSavedSegmentOfAWholeFrame) {
  const Outcome out = ParseExact(Frame());
  EXPECT_FALSE(out.jumped);
  EXPECT_EQ(out.width, 64u);
  EXPECT_EQ(out.height, 48u);
  EXPECT_EQ(out.saved_length, 12u);
  EXPECT_EQ(out.first_saved_byte, 'h');
  EXPECT_EQ(out.warnings, 0);
}

TEST(JpegSrcTest, DecodesAWholeFrame) {
  const Outcome out = ParseExact(Frame(), true);
  EXPECT_FALSE(out.jumped);
  EXPECT_EQ(out.rows_decoded, 48u);
  EXPECT_EQ(out.warnings, 0);
}

TEST(JpegSrcTest, NullOrEmptyInputIsALibraryError) {
  Outcome out;
  Parse(nullptr, 100, false, &out);
  EXPECT_TRUE(out.jumped);
  EXPECT_EQ(out.error_code, JERR_INPUT_EMPTY);
  const unsigned char byte = 0xFF;
  Parse(&byte, 0, false, &out);
  EXPECT_TRUE(out.jumped);
  EXPECT_EQ(out.error_code, JERR_INPUT_EMPTY);
}

TEST(JpegSrcTest, FrameCutInsideTheHeaderJumpsBackWithoutPrinting) {
  const std::string frame = Frame();
  testing::internal::CaptureStderr();
  int jumps = 0;
  // Every cut inside the header: the source hands out a fake EOI, the header read fails.
  for (size_t cut = 1; cut < 40; ++cut) {
    const Outcome out = ParseExact(frame.substr(0, cut));
    EXPECT_TRUE(out.jumped) << "cut at " << cut;
    jumps += out.jumped ? 1 : 0;
  }
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_EQ(jumps, 39);
}

TEST(JpegSrcTest, FrameCutAnywhereEndsCleanly) {
  const std::string frame = Frame();
  testing::internal::CaptureStderr();
  int headers_read = 0;
  for (size_t cut = 1; cut < frame.size(); ++cut) {
    const Outcome out = ParseExact(frame.substr(0, cut), true);
    if (!out.jumped) {
      ++headers_read;
      // Past the header the fake EOI lets the decoder finish the picture with a warning.
      EXPECT_EQ(out.rows_decoded, 48u) << "cut at " << cut;
      EXPECT_GT(out.warnings, 0) << "cut at " << cut;
    }
  }
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_GT(headers_read, 0);
}

TEST(JpegSrcTest, SkipPastTheEndGivesTheFakeEoi) {
  // An APP1 segment (not saved, so skipped) that claims more bytes than the frame holds.
  std::string bytes = "\xFF\xD8\xFF\xE1\x40\x00";
  bytes += std::string(20, 'x');
  testing::internal::CaptureStderr();
  const Outcome out = ParseExact(bytes);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_TRUE(out.jumped);
  EXPECT_EQ(out.error_code, JERR_NO_IMAGE);
}

TEST(JpegSrcTest, CorruptFramesNeverPrintOrReadOutside) {
  const std::string frame = Frame();
  std::mt19937 random(7);
  testing::internal::CaptureStderr();
  int jumps = 0;
  for (int round = 0; round < 300; ++round) {
    std::string bad = frame;
    for (int flips = 0; flips < 4; ++flips) {
      bad[random() % bad.size()] = static_cast<char>(random() & 0xFF);
    }
    jumps += ParseExact(bad, true).jumped ? 1 : 0;
  }
  std::string noise(500, '\0');
  for (char& c : noise) c = static_cast<char>(random() & 0xFF);
  const Outcome from_noise = ParseExact(noise);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_TRUE(from_noise.jumped);
  EXPECT_GT(jumps, 0);
}

TEST(JpegSrcTest, SourceIsReusedOnTheSameObject) {
  const std::string a = Frame();
  const std::string b = EncodeGreyJpeg(32, 16, 10, {JpegSegment{kJpegApp0, "x"}});
  JpegErrorJump error;
  jpeg_decompress_struct cinfo;
  SetJpegExit(&cinfo, &error);
  if (setjmp(error.jump) != 0) {
    jpeg_destroy_decompress(&cinfo);
    FAIL() << "library error " << error.mgr.msg_code;
  }
  jpeg_CreateDecompress(&cinfo, JPEG_LIB_VERSION, sizeof(cinfo));
  JpegMemSrc(&cinfo, reinterpret_cast<const unsigned char*>(a.data()), a.size());
  jpeg_source_mgr* first = cinfo.src;
  jpeg_read_header(&cinfo, TRUE);
  EXPECT_EQ(cinfo.image_width, 64u);
  jpeg_abort_decompress(&cinfo);
  JpegMemSrc(&cinfo, reinterpret_cast<const unsigned char*>(b.data()), b.size());
  EXPECT_EQ(cinfo.src, first);
  jpeg_read_header(&cinfo, TRUE);
  EXPECT_EQ(cinfo.image_width, 32u);
  jpeg_destroy_decompress(&cinfo);
}

}  // namespace
