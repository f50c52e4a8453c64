// Edimax network cameras: an event stream at the path that the camera's CameraAPI names,
// fetched on the camera's own port (these cameras serve it there whatever port the API
// names). The camera announces motion in the header lines of each pushed part: EDIMAXMD
// reports motion (level 100) while a line there reads "motion-event: 1". It judges every
// part as it comes.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the
// detector's run.

#ifndef EVWATCH_DETECTORS_EDIMAX_H_
#define EVWATCH_DETECTORS_EDIMAX_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class EDIMAXMD : public DetectorBase {
 public:
  EDIMAXMD(Camera* camera, CameraAPI* api);
  ~EDIMAXMD() override;

  // Reads one part and judges the text before its body (up to its zero byte). 0 when a
  // part was read and judged, -1 otherwise (no fetcher, a failed read); motion and level
  // are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Without a camera, an API or a stream from it, it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
};

#endif  // EVWATCH_DETECTORS_EDIMAX_H_
