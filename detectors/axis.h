// Axis network cameras.
//
// AXISEID: the camera's alarm inputs, asked once a second one by one at
// axis-cgi/io/input.cgi?checkactive=N; active while some input N answers inputN=active.
// The answer is read by SendHttpReqAndCheckLine, the Axis-family check (first match ends it).
//
// AxisMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), a multipart stream whose parts hold lines
// "group=G;level=L;threshold=T;". A part is motion when some line's level is above its
// threshold (compared unsigned); the level reported is that line's, or without motion the
// last line's. AvipcMD, ZavioMD and AirliveV1MD read the same data.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_AXIS_H_
#define EVWATCH_DETECTORS_AXIS_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class AXISEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AXISEID(Camera* camera, int inputs);
  ~AXISEID() override;

  // Asks inputs 1..inputs in order and stops at the first active one. An input whose
  // request fails counts as not active. -1 without a camera, else 0.
  int DoEID(bool& active);
  // Asks about one input and sets `active`. Returns 0.
  int QueryCamera(int input, bool& active);
  // Asks once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

class AxisMD : public DetectorBase {
 public:
  AxisMD(Camera* camera, CameraAPI* api);
  ~AxisMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read, no room for the part); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Scans one part body: 1 when a line's level is above its threshold, with that level;
  // else 0 with the last non-empty line's level (0 when that line did not match). A
  // negative length returns 0 and leaves `level` alone.
  int IsMotionDetected(char* body, int length, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; names the motion-data stream
};

#endif  // EVWATCH_DETECTORS_AXIS_H_
