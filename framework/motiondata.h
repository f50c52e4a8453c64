// Motion data that cameras push as a multipart stream: each part holds text lines, each
// naming a detection window, its current level and its threshold. The Axis, AVIPC, Zavio,
// AirLive and IQeye motion detectors share the part reading and the line scan written here;
// they differ only in the line format and in which level they report without motion.
//
// Threads: pure functions, run on the calling detector's worker thread.

#ifndef EVWATCH_FRAMEWORK_MOTIONDATA_H_
#define EVWATCH_FRAMEWORK_MOTIONDATA_H_

#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

enum class MotionLineFormat {
  kGroupChar,     // group=%c;level=%d;threshold=%d;  (a one-character group)
  kGroupNumber,   // group=%d;level=%d;threshold=%d;
  kWindowNumber,  // window=%d;level=%d;threshold=%d
};

// The level left in `level` when no line shows motion.
enum class IdleLevel {
  kLastLine,  // that of the last non-empty line (0 when it did not match)
  kLargest,   // the largest of all lines, 0 when none; a negative length gives 0
};

// Scans body[0, length) line by line (lines of up to 127 characters; a longer one goes on as
// the next line). Each non-empty line is scanned for its level and threshold, both 0 where
// the line does not give them; a line that ends before its first field ends the whole scan.
// Returns 1 at the first line whose level is greater than its threshold, compared as
// unsigned 32-bit numbers (so a level of -1 beats any threshold), with that level in
// `level`; else 0 with the idle level. A negative length returns 0 and, for kLastLine,
// leaves `level` as it was.
int ScanMotionLines(const char* body, int length, unsigned int& level, MotionLineFormat format,
                    IdleLevel idle);

// One part of a motion-data stream: clears motion and level, reads the part as `shape` says
// and sets motion to judge(text, length, level) (bool) over what StreamPart gives to judge.
// 0 when a part was read and judged; -1 when there is no fetcher or the part could not be
// read (the fetcher has skipped what was left of it).
template <typename Judge>
int ReadMotionPart(MultipartFetch* fetch, const StreamPart::Shape& shape, bool& motion,
                   unsigned int& level, Judge&& judge) {
  level = 0;
  return ReadJudgedPart(fetch, shape, motion,
                        [&](char* text, int length) { return judge(text, length, level); });
}

// The same with the plain shape: the body judged over the part's length.
template <typename Judge>
int ReadMotionPart(MultipartFetch* fetch, bool& motion, unsigned int& level, Judge&& judge) {
  return ReadMotionPart(fetch, StreamPart::Shape{}, motion, level, judge);
}

// The worker loop of a detector whose stream the camera's CameraAPI names (path and port):
// returns at once, reporting nothing, without a camera, an API or a stream from it; else
// runs RunMotionStreamLoop with doMD(fetch, motion, level) on that stream.
template <typename DoMD>
void RunApiMotionDataLoop(DetectorBase& detector, EventBuf* buffer, Camera* camera, CameraAPI* api,
                          DoMD&& doMD) {
  if (camera == nullptr || api == nullptr) return;
  std::string path;
  int port = 80;
  if (!GetApiStream(*api, path, port)) return;
  RunMotionStreamLoop(detector, buffer, *camera, path, port, doMD);
}

// The same for a detector whose stream has a fixed path on the camera's own port: returns
// at once, reporting nothing, without a camera.
template <typename DoMD>
void RunFixedMotionDataLoop(DetectorBase& detector, EventBuf* buffer, Camera* camera,
                            const char* path, DoMD&& doMD) {
  if (camera == nullptr) return;
  RunMotionStreamLoop(detector, buffer, *camera, path, camera->GetPort(), doMD);
}

// The family's motion-data detector, written once; each maker's class names its line
// format, its idle level and where its stream is. A part is motion when some line's level is
// above its threshold; the level reported is that line's, or without motion the idle level.
class MotionDataMD : public DetectorBase {
 public:
  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read, no room for the part); motion and level are false and 0 then.
  virtual int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Scans one part body: 1 when a line's level is above its threshold, with that level;
  // else 0 with the idle level. A negative length returns 0 and leaves a last-line `level`
  // alone.
  int IsMotionDetected(char* body, int length, unsigned int& level);
  // Follows the stream until stopped; without a camera (or, for a stream the API names,
  // without an API or its stream) it ends at once and reports nothing.
  int EventDetecor() override;

 protected:
  struct Shape {
    MotionLineFormat format;
    IdleLevel idle;
    const char* fixed_path;  // the stream's path on the camera's port; null: the API's stream
  };
  MotionDataMD(Camera* camera, CameraAPI* api, Shape shape);

  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; may be null for a fixed path

 private:
  Shape shape_;
};

#endif  // EVWATCH_FRAMEWORK_MOTIONDATA_H_
