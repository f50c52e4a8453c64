// AVIPC network cameras.
//
// AVIPCEID: the camera's alarm inputs, asked once a second one by one at
// cgi-bin/io/input.cgi?checkactive=N; active while some input N answers inputN=active.
// The answer is read by the shared key/value check (SendHttpReqAndCheckResp).
//
// AvipcMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), lines "group=G;level=L;threshold=T;", judged as AxisMD judges them.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_AVIPC_H_
#define EVWATCH_DETECTORS_AVIPC_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class AVIPCEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AVIPCEID(Camera* camera, int inputs);
  ~AVIPCEID() override;

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

class AvipcMD : public DetectorBase {
 public:
  AvipcMD(Camera* camera, CameraAPI* api);
  ~AvipcMD() override;

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

#endif  // EVWATCH_DETECTORS_AVIPC_H_
