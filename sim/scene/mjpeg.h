// Motion-JPEG for the simulator: JPEG frames made with libjpeg (pixels plus marker segments
// that cameras use to carry their event state), and the multipart/x-mixed-replace stream
// that serves them.
//
// Threads: the functions keep no state; any number of threads may call them at once.

#ifndef EVWATCH_SIM_SCENE_MJPEG_H_
#define EVWATCH_SIM_SCENE_MJPEG_H_

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"

namespace evsim {

// Marker codes of the segments cameras write.
constexpr int kJpegApp0 = 0xE0;
constexpr int kJpegApp2 = 0xE2;
constexpr int kJpegCom = 0xFE;

// One marker segment of a frame header. The payload is what follows the two-byte length
// field, at most kMaxSegmentPayload bytes.
struct JpegSegment {
  int marker;           // kJpegCom, kJpegApp0 .. 0xEF
  std::string payload;
};
constexpr size_t kMaxSegmentPayload = 65533;

struct JpegOptions {
  int quality = 75;   // 1..100
  bool jfif = false;  // write libjpeg's JFIF APP0 ahead of the segments
  int jfif_minor = 1; // JFIF version 1.<minor> when jfif is set
  // Colour frames: the luminance's sampling factors (1..2 each; chroma is sampled once per
  // MCU), 2x2 being 4:2:0.
  int luma_h = 2;
  int luma_v = 2;
  int restart_interval = 0;  // MCUs between restart markers; 0 for none
  bool optimize = false;     // Huffman tables made for the frame instead of the standard ones
  bool progressive = false;
};

// An image: rows top-down, width * components bytes each, 1 component (grey) or 3 (RGB).
struct JpegImage {
  const unsigned char* pixels;
  int width;
  int height;
  int components;
};

// A baseline JPEG of `image` whose header holds `segments` in order, right after the SOI
// (after the JFIF APP0 when options.jfif). Empty on bad arguments (size, components, a
// payload too long, marker not COM or APPn) or a library error.
std::string EncodeJpeg(const JpegImage& image, const std::vector<JpegSegment>& segments,
                       const JpegOptions& options = JpegOptions());

// A uniform grey frame of width x height (grey level `grey`) with the segments.
std::string EncodeGreyJpeg(int width, int height, unsigned char grey,
                           const std::vector<JpegSegment>& segments,
                           const JpegOptions& options = JpegOptions());

// Serves a multipart/x-mixed-replace stream on `connection`: the response head, then one
// part per `period`, each the body that next_part() returns, with Content-Type
// `content_type` and Content-Length. Returns when the peer goes, the server stops, or
// next_part returns an empty string.
void ServeMultipart(HttpConnection& connection, const std::string& content_type,
                    std::chrono::milliseconds period,
                    const std::function<std::string()>& next_part);

// One part of a pushed stream, with the text that some cameras send around its body.
struct PushPart {
  std::string body;
  std::string headers;  // further part-header lines, each ending in CR LF
  std::string trailer;  // text after the body's CR LF and before the next boundary
};

// As ServeMultipart, with parts that carry such text; ends when next_part returns nullopt.
void ServeMultipartParts(HttpConnection& connection, const std::string& content_type,
                         std::chrono::milliseconds period,
                         const std::function<std::optional<PushPart>()>& next_part);

// The frame period that a stream request asks for with "fps=N" in its query (N in 1..100),
// else 1 s / default_fps.
std::chrono::milliseconds FramePeriod(const HttpRequest& request, int default_fps);

// Serves the motion-JPEG stream of a camera that writes its event state into its frames:
// every `period` a small grey frame whose header holds segments(status) for the camera's
// state at that moment. A frame is encoded again only when its segments change. Ends when the
// peer goes, the server stops or the camera falls silent (the simulator then holds later
// requests unanswered while it stays silent).
void ServeEventFrames(HttpConnection& connection, const CameraState& state,
                      std::chrono::milliseconds period,
                      const std::function<std::vector<JpegSegment>(const CameraStatus&)>& segments);

}  // namespace evsim

#endif  // EVWATCH_SIM_SCENE_MJPEG_H_
