#include "sim/scene/mjpeg.h"

#include <algorithm>
#include <csetjmp>
#include <cstdlib>
#include <new>

#include "framework/host/jpegsrc.h"

#include <jerror.h>

namespace evsim {
namespace {

constexpr char kBoundary[] = "simframe";
constexpr size_t kChunk = 16384;
constexpr int kMaxFps = 100;
// Event frames: small, since only their headers matter, and brighter while there is motion.
constexpr int kEventFrameWidth = 160;
constexpr int kEventFrameHeight = 120;

// Destination that appends the library's output to a string in chunks.
struct StringDest {
  jpeg_destination_mgr mgr;  // first member: the library's pointer is the whole record
  std::string* out;
  JOCTET chunk[kChunk];
};

void InitDestination(j_compress_ptr cinfo) {
  StringDest* dest = reinterpret_cast<StringDest*>(cinfo->dest);
  dest->mgr.next_output_byte = dest->chunk;
  dest->mgr.free_in_buffer = kChunk;
}

// Append without letting an exception cross the C library.
bool Append(StringDest* dest, size_t count) {
  try {
    dest->out->append(reinterpret_cast<const char*>(dest->chunk), count);
    return true;
  } catch (const std::bad_alloc&) {
    return false;
  }
}

boolean EmptyOutputBuffer(j_compress_ptr cinfo) {
  StringDest* dest = reinterpret_cast<StringDest*>(cinfo->dest);
  if (!Append(dest, kChunk)) ERREXIT(cinfo, JERR_OUT_OF_MEMORY);
  dest->mgr.next_output_byte = dest->chunk;
  dest->mgr.free_in_buffer = kChunk;
  return TRUE;
}

void TermDestination(j_compress_ptr cinfo) {
  StringDest* dest = reinterpret_cast<StringDest*>(cinfo->dest);
  if (!Append(dest, kChunk - dest->mgr.free_in_buffer)) ERREXIT(cinfo, JERR_OUT_OF_MEMORY);
}

bool ValidArguments(const JpegImage& image, const std::vector<JpegSegment>& segments,
                    const JpegOptions& options) {
  if (image.pixels == nullptr || image.width <= 0 || image.height <= 0 ||
      image.width > JPEG_MAX_DIMENSION || image.height > JPEG_MAX_DIMENSION ||
      (image.components != 1 && image.components != 3) || options.quality < 1 ||
      options.quality > 100 || options.luma_h < 1 || options.luma_h > 2 || options.luma_v < 1 ||
      options.luma_v > 2 || options.restart_interval < 0 || options.restart_interval > 65535) {
    return false;
  }
  for (const JpegSegment& segment : segments) {
    const bool app = segment.marker >= JPEG_APP0 && segment.marker <= JPEG_APP0 + 15;
    if ((!app && segment.marker != JPEG_COM) || segment.payload.size() > kMaxSegmentPayload) {
      return false;
    }
  }
  return true;
}

// The library work, with nothing in this frame that longjmp could skip a destructor of.
bool Compress(const JpegImage& image, const std::vector<JpegSegment>& segments,
              const JpegOptions& options, std::string* out) {
  JpegErrorJump error;
  jpeg_compress_struct cinfo;
  SetJpegExit(&cinfo, &error);
  if (setjmp(error.jump) != 0) {
    jpeg_destroy_compress(&cinfo);
    return false;
  }
  jpeg_CreateCompress(&cinfo, JPEG_LIB_VERSION, sizeof(cinfo));
  StringDest* dest = static_cast<StringDest*>((*cinfo.mem->alloc_small)(
      reinterpret_cast<j_common_ptr>(&cinfo), JPOOL_PERMANENT, sizeof(StringDest)));
  dest->mgr.init_destination = InitDestination;
  dest->mgr.empty_output_buffer = EmptyOutputBuffer;
  dest->mgr.term_destination = TermDestination;
  dest->out = out;
  cinfo.dest = &dest->mgr;

  cinfo.image_width = static_cast<JDIMENSION>(image.width);
  cinfo.image_height = static_cast<JDIMENSION>(image.height);
  cinfo.input_components = image.components;
  cinfo.in_color_space = image.components == 1 ? JCS_GRAYSCALE : JCS_RGB;
  jpeg_set_defaults(&cinfo);
  jpeg_set_quality(&cinfo, options.quality, TRUE);
  cinfo.write_JFIF_header = options.jfif ? TRUE : FALSE;
  cinfo.JFIF_minor_version = static_cast<UINT8>(options.jfif_minor);
  if (image.components == 3) {
    cinfo.comp_info[0].h_samp_factor = options.luma_h;
    cinfo.comp_info[0].v_samp_factor = options.luma_v;
  }
  cinfo.restart_interval = static_cast<unsigned int>(options.restart_interval);
  cinfo.optimize_coding = options.optimize ? TRUE : FALSE;
  if (options.progressive) jpeg_simple_progression(&cinfo);
  jpeg_start_compress(&cinfo, TRUE);
  for (const JpegSegment& segment : segments) {
    jpeg_write_marker(&cinfo, segment.marker,
                      reinterpret_cast<const JOCTET*>(segment.payload.data()),
                      static_cast<unsigned int>(segment.payload.size()));
  }
  const size_t stride = static_cast<size_t>(image.width) * image.components;
  while (cinfo.next_scanline < cinfo.image_height) {
    JSAMPROW row = const_cast<JSAMPROW>(image.pixels + cinfo.next_scanline * stride);
    jpeg_write_scanlines(&cinfo, &row, 1);
  }
  jpeg_finish_compress(&cinfo);
  jpeg_destroy_compress(&cinfo);
  return true;
}

}  // namespace

std::string EncodeJpeg(const JpegImage& image, const std::vector<JpegSegment>& segments,
                       const JpegOptions& options) {
  if (!ValidArguments(image, segments, options)) return std::string();
  std::string out;
  if (!Compress(image, segments, options, &out)) return std::string();
  return out;
}

std::string EncodeGreyJpeg(int width, int height, unsigned char grey,
                           const std::vector<JpegSegment>& segments, const JpegOptions& options) {
  if (width <= 0 || height <= 0 || width > JPEG_MAX_DIMENSION || height > JPEG_MAX_DIMENSION) {
    return std::string();
  }
  const std::string pixels(static_cast<size_t>(width) * height, static_cast<char>(grey));
  const JpegImage image{reinterpret_cast<const unsigned char*>(pixels.data()), width, height, 1};
  return EncodeJpeg(image, segments, options);
}

void ServeMultipartParts(HttpConnection& connection, const std::string& content_type,
                         std::chrono::milliseconds period,
                         const std::function<std::optional<PushPart>()>& next_part) {
  const std::string head = std::string("HTTP/1.1 200 OK\r\n") +
                           "Content-Type: multipart/x-mixed-replace;boundary=" + kBoundary +
                           "\r\nCache-Control: no-cache\r\nConnection: close\r\n\r\n";
  if (!connection.Write(head)) return;
  for (;;) {
    const std::optional<PushPart> next = next_part();
    if (!next) return;
    std::string part = std::string("--") + kBoundary + "\r\nContent-Type: " + content_type +
                       "\r\nContent-Length: " + std::to_string(next->body.size()) + "\r\n" +
                       next->headers + "\r\n";
    part += next->body;
    part += "\r\n";
    part += next->trailer;
    if (!connection.Write(part) || !connection.SleepFor(period)) return;
  }
}

void ServeMultipart(HttpConnection& connection, const std::string& content_type,
                    std::chrono::milliseconds period,
                    const std::function<std::string()>& next_part) {
  ServeMultipartParts(connection, content_type, period, [&]() -> std::optional<PushPart> {
    std::string body = next_part();
    if (body.empty()) return std::nullopt;
    return PushPart{std::move(body), "", ""};
  });
}

std::chrono::milliseconds FramePeriod(const HttpRequest& request, int default_fps) {
  int fps = default_fps;
  const std::string& target = request.target;
  const size_t query = target.find('?');
  if (query != std::string::npos) {
    for (size_t at = query + 1; at < target.size();) {
      size_t end = target.find('&', at);
      if (end == std::string::npos) end = target.size();
      if (target.compare(at, 4, "fps=") == 0) fps = std::atoi(target.substr(at + 4, end - at - 4).c_str());
      at = end + 1;
    }
  }
  fps = std::clamp(fps, 1, kMaxFps);
  return std::chrono::milliseconds(1000 / fps);
}

void ServeEventFrames(HttpConnection& connection, const CameraState& state,
                      std::chrono::milliseconds period,
                      const std::function<std::vector<JpegSegment>(const CameraStatus&)>& segments) {
  std::vector<JpegSegment> shown;
  std::string frame;
  ServeMultipart(connection, "image/jpeg", period, [&]() -> std::string {
    const CameraStatus status = state.Get();
    if (status.silent) return std::string();
    std::vector<JpegSegment> now = segments(status);
    const bool same = frame.size() > 0 && now.size() == shown.size() &&
                      std::equal(now.begin(), now.end(), shown.begin(),
                                 [](const JpegSegment& a, const JpegSegment& b) {
                                   return a.marker == b.marker && a.payload == b.payload;
                                 });
    if (!same) {
      const unsigned char grey = static_cast<unsigned char>(60 + status.motion);
      frame = EncodeGreyJpeg(kEventFrameWidth, kEventFrameHeight, grey, now);
      shown = std::move(now);
    }
    return frame;
  });
}

}  // namespace evsim
