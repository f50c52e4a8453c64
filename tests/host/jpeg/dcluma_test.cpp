#include "host/jpeg/dcluma.h"

#include <gtest/gtest.h>

#include <csetjmp>
#include <string>
#include <vector>

#include "framework/host/jpegsrc.h"
#include "sim/scene/mjpeg.h"
#include "sim/scene/scene.h"

namespace {

using evsim::EncodeJpeg;
using evsim::JpegImage;
using evsim::JpegOptions;

// A frame's luminance at 1/8 as libjpeg-turbo gives it, and as the decoder does.
struct Outcome {
  bool header = false;   // the library read the header
  bool taken = false;    // the decoder decoded the frame
  bool library = false;  // the library decoded it without an error or warning
  int width = 0, height = 0;
  int luma_h = 0, luma_v = 0;  // the luminance's sampling factors in the header
  std::vector<uint8_t> ours, theirs;
};

class Decompressor {
 public:
  Decompressor() {
    SetJpegExit(&cinfo_, &error_);
    jpeg_CreateDecompress(&cinfo_, JPEG_LIB_VERSION, sizeof(cinfo_));
  }
  ~Decompressor() { jpeg_destroy_decompress(&cinfo_); }

  // Asks the decoder for an output `extra_width` columns wider than the frame's.
  Outcome Run(DcLumaDecoder& decoder, const std::string& jpeg, int extra_width = 0) {
    Outcome o;
    error_.mgr.num_warnings = 0;
    if (!ReadHeader(jpeg, &o)) return o;
    o.ours.assign(static_cast<size_t>(o.width + extra_width) * o.height, 0);
    o.taken = decoder.Decode(cinfo_, o.ours.data(), o.width + extra_width, o.height);
    o.ours.resize(static_cast<size_t>(o.width) * o.height);
    o.theirs.assign(o.ours.size(), 0);
    o.library = DecodeRest(o.theirs.data(), o.width) && error_.mgr.num_warnings == 0;
    return o;
  }

 private:
  bool ReadHeader(const std::string& jpeg, Outcome* o) {
    if (setjmp(error_.jump) != 0) {
      jpeg_abort_decompress(&cinfo_);
      return false;
    }
    JpegMemSrc(&cinfo_, reinterpret_cast<const unsigned char*>(jpeg.data()), jpeg.size());
    jpeg_read_header(&cinfo_, TRUE);
    cinfo_.scale_num = 1;
    cinfo_.scale_denom = 8;
    cinfo_.out_color_space = JCS_GRAYSCALE;
    jpeg_calc_output_dimensions(&cinfo_);
    o->luma_h = cinfo_.comp_info[0].h_samp_factor;
    o->luma_v = cinfo_.comp_info[0].v_samp_factor;
    o->width = static_cast<int>(cinfo_.output_width);
    o->height = static_cast<int>(cinfo_.output_height);
    o->header = true;
    return true;
  }
  bool DecodeRest(uint8_t* out, int width) {
    if (setjmp(error_.jump) != 0) {
      jpeg_abort_decompress(&cinfo_);
      return false;
    }
    jpeg_start_decompress(&cinfo_);
    while (cinfo_.output_scanline < cinfo_.output_height) {
      JSAMPROW row = out + static_cast<size_t>(cinfo_.output_scanline) * width;
      jpeg_read_scanlines(&cinfo_, &row, 1);
    }
    jpeg_finish_decompress(&cinfo_);
    return true;
  }

  JpegErrorJump error_;
  jpeg_decompress_struct cinfo_;
};

std::string SceneJpeg(int width, int height, const JpegOptions& options, uint32_t seed = 3,
                      int components = 3) {
  evsim::SceneOptions so;
  so.width = width;
  so.height = height;
  so.seed = seed;
  so.noise = 6.0;
  evsim::Scene scene(so);
  evsim::SceneObject object;
  object.x = 0.3;
  object.y = 0.2;
  object.width = object.height = 0.3;
  scene.AddObject(object);
  const std::vector<uint8_t>& rgb = scene.Render();
  if (components == 3) return EncodeJpeg(JpegImage{rgb.data(), width, height, 3}, {}, options);
  std::vector<uint8_t> grey(static_cast<size_t>(width) * height);
  for (size_t i = 0; i < grey.size(); ++i) grey[i] = rgb[3 * i + 1];
  return EncodeJpeg(JpegImage{grey.data(), width, height, 1}, {}, options);
}

class DcLumaTest : public ::testing::Test {
 protected:
  Outcome Run(const std::string& jpeg, int extra_width = 0) {
    return decompressor_.Run(decoder_, jpeg, extra_width);
  }

  // The decoder takes the frame, when its tables come the second time in a row, and gives
  // the library's bytes.
  void ExpectSame(const std::string& jpeg) {
    ASSERT_FALSE(jpeg.empty());
    Run(jpeg);
    const Outcome o = Run(jpeg);
    ASSERT_TRUE(o.header);
    ASSERT_TRUE(o.library);
    EXPECT_TRUE(o.taken);
    EXPECT_EQ(o.ours, o.theirs);
  }

  DcLumaDecoder decoder_;
  Decompressor decompressor_;
};

TEST_F(DcLumaTest, EqualsLibraryAtEverySamplingAndOddSizes) {
  const int sizes[][2] = {{640, 480}, {321, 241}, {8, 8}, {1, 1}, {17, 9}, {1000, 3}};
  const int samplings[][2] = {{2, 2}, {2, 1}, {1, 1}, {1, 2}};
  for (const auto& size : sizes) {
    for (const auto& sampling : samplings) {
      JpegOptions options;
      options.luma_h = sampling[0];
      options.luma_v = sampling[1];
      SCOPED_TRACE(std::to_string(size[0]) + "x" + std::to_string(size[1]) + " sampling " +
                   std::to_string(sampling[0]) + "x" + std::to_string(sampling[1]));
      const std::string jpeg = SceneJpeg(size[0], size[1], options);
      ExpectSame(jpeg);
      const Outcome o = Run(jpeg);
      EXPECT_EQ(o.luma_h, sampling[0]);
      EXPECT_EQ(o.luma_v, sampling[1]);
    }
  }
}

TEST_F(DcLumaTest, EqualsLibraryAcrossQualities) {
  for (int quality : {5, 30, 75, 95, 100}) {
    JpegOptions options;
    options.quality = quality;
    SCOPED_TRACE("quality " + std::to_string(quality));
    ExpectSame(SceneJpeg(320, 240, options, 11));
  }
}

TEST_F(DcLumaTest, EqualsLibraryWithRestartMarkers) {
  for (int interval : {1, 2, 7, 40}) {
    JpegOptions options;
    options.restart_interval = interval;
    SCOPED_TRACE("interval " + std::to_string(interval));
    ExpectSame(SceneJpeg(333, 250, options, 5));
  }
}

TEST_F(DcLumaTest, EqualsLibraryWithOptimizedTablesAndLongCodes) {
  JpegOptions options;
  options.optimize = true;
  options.quality = 98;
  ExpectSame(SceneJpeg(400, 300, options, 8));
}

TEST_F(DcLumaTest, EqualsLibraryForGreyFrames) {
  JpegOptions options;
  ExpectSame(SceneJpeg(321, 199, options, 4, 1));
  options.restart_interval = 3;
  ExpectSame(SceneJpeg(321, 199, options, 4, 1));
}

TEST_F(DcLumaTest, MakesTablesThatComeTwiceInARowAndKeepsThem) {
  JpegOptions standard, optimized;
  optimized.optimize = true;
  const std::string a = SceneJpeg(160, 120, standard, 1);
  const std::string b = SceneJpeg(160, 120, optimized, 2);
  const std::string c = SceneJpeg(160, 120, optimized, 3);  // tables of its own
  Outcome o = Run(a);
  EXPECT_FALSE(o.taken);  // new tables: the library decodes
  ASSERT_TRUE(o.library);
  o = Run(a);
  EXPECT_TRUE(o.taken);
  EXPECT_EQ(o.ours, o.theirs);
  // A frame with other tables is left to the library; the tables made stay.
  EXPECT_FALSE(Run(b).taken);
  o = Run(a);
  EXPECT_TRUE(o.taken);
  EXPECT_EQ(o.ours, o.theirs);
  // Frames whose tables change every time are all left to the library.
  EXPECT_FALSE(Run(b).taken);
  EXPECT_FALSE(Run(c).taken);
  EXPECT_FALSE(Run(b).taken);
  // c's tables, twice in a row: made, and right.
  Run(c);
  o = Run(c);
  EXPECT_TRUE(o.taken);
  EXPECT_EQ(o.ours, o.theirs);
}

TEST_F(DcLumaTest, LeavesProgressiveFramesToTheLibrary) {
  JpegOptions options;
  options.progressive = true;
  const std::string jpeg = SceneJpeg(160, 120, options);
  Run(jpeg);
  const Outcome o = Run(jpeg);
  ASSERT_TRUE(o.library);
  EXPECT_FALSE(o.taken);
}

TEST_F(DcLumaTest, LeavesTruncatedFramesToTheLibrary) {
  const std::string jpeg = SceneJpeg(320, 240, JpegOptions());
  ExpectSame(jpeg);  // the tables are made: only the data can be refused
  for (size_t cut : {jpeg.size() - 2, jpeg.size() - 3, jpeg.size() / 2, jpeg.size() - 200}) {
    SCOPED_TRACE("cut at " + std::to_string(cut));
    const Outcome o = Run(jpeg.substr(0, cut));
    ASSERT_TRUE(o.header);
    EXPECT_FALSE(o.taken);
    EXPECT_FALSE(o.library);  // the library warns: the frame is not clean either way
  }
}

TEST_F(DcLumaTest, LeavesExtraDataBeforeTheEndToTheLibrary) {
  std::string jpeg = SceneJpeg(320, 240, JpegOptions());
  ExpectSame(jpeg);
  ASSERT_EQ(jpeg.substr(jpeg.size() - 2), "\xFF\xD9");
  jpeg.insert(jpeg.size() - 2, "\x12\x34");
  const Outcome o = Run(jpeg);
  EXPECT_FALSE(o.taken);
}

TEST_F(DcLumaTest, LeavesAMissingRestartMarkerToTheLibrary) {
  JpegOptions options;
  options.restart_interval = 4;
  std::string jpeg = SceneJpeg(320, 240, options);
  ExpectSame(jpeg);
  const size_t marker = jpeg.find("\xFF\xD1");  // the second restart marker
  ASSERT_NE(marker, std::string::npos);
  jpeg[marker + 1] = '\xD3';  // out of order
  const Outcome o = Run(jpeg);
  ASSERT_TRUE(o.header);
  EXPECT_FALSE(o.taken);
}

TEST_F(DcLumaTest, LeavesAComponentWithoutQuantizationTableToTheLibrary) {
  std::string jpeg = SceneJpeg(160, 120, JpegOptions());
  ExpectSame(jpeg);
  const size_t sof = jpeg.find("\xFF\xC0");
  ASSERT_NE(sof, std::string::npos);
  // Marker, length, precision, height, width, count; then per component its id, sampling
  // and table number: the second component's table becomes one the frame lacks.
  jpeg[sof + 10 + 3 + 2] = 3;
  const Outcome o = Run(jpeg);
  ASSERT_TRUE(o.header);
  EXPECT_FALSE(o.library);
  EXPECT_FALSE(o.taken);
}

TEST_F(DcLumaTest, NeverDisagreesWithTheLibraryOnDamagedData) {
  // Flipped bits, 0xFF bytes, cuts and inserted bytes, in the header or anywhere: whenever
  // the decoder takes a frame, the library decodes it cleanly and to the same bytes.
  std::vector<std::string> clean;
  for (int k = 0; k < 4; ++k) {
    JpegOptions options;
    options.restart_interval = k % 2 == 0 ? 0 : 3;
    options.luma_h = k < 2 ? 2 : 1;
    clean.push_back(SceneJpeg(96 + 8 * k, 64 + 4 * k, options, 9 + k, k == 3 ? 1 : 3));
  }
  uint32_t random = 12345;
  auto next = [&random]() {
    random = random * 1103515245u + 12345u;
    return random >> 8;
  };
  int taken = 0;
  for (int trial = 0; trial < 3000; ++trial) {
    std::string jpeg = clean[trial % clean.size()];
    const uint32_t kind = next() % 16;
    for (uint32_t changes = 1 + next() % 3; changes > 0; --changes) {
      const size_t span = next() % 2 == 0 ? std::min<size_t>(jpeg.size(), 700) : jpeg.size();
      const size_t at = next() % span;
      if (kind < 10) {
        jpeg[at] = static_cast<char>(jpeg[at] ^ (1 << next() % 8));
      } else if (kind < 12) {
        jpeg[at] = '\xFF';
      } else if (kind < 14) {
        jpeg.resize(at + 1);
      } else {
        jpeg.insert(at, 1 + next() % 8, static_cast<char>(next()));
      }
    }
    for (int pass = 0; pass < 2; ++pass) {  // the second pass finds its tables made
      const Outcome o = Run(jpeg);
      if (!o.header || !o.taken) continue;
      ++taken;
      EXPECT_TRUE(o.library) << "trial " << trial;
      EXPECT_EQ(o.ours, o.theirs) << "trial " << trial;
    }
  }
  // Many changes only alter a coefficient's value and leave the frame decodable.
  EXPECT_GT(taken, 100);
}

TEST_F(DcLumaTest, RefusesAnOutputOfAnotherSize) {
  const std::string jpeg = SceneJpeg(64, 48, JpegOptions());
  ExpectSame(jpeg);
  Outcome o = Run(jpeg, 1);
  ASSERT_TRUE(o.library);
  EXPECT_FALSE(o.taken);
  o = Run(jpeg);
  EXPECT_TRUE(o.taken);
  EXPECT_EQ(o.width, 8);
  EXPECT_EQ(o.height, 6);
}

}  // namespace
