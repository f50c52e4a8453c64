// Zavio network cameras.
//
// ZavioEID: the camera's alarm inputs, asked once a second one by one at
// cgi-bin/admin/input?checkactive=N; active while some input N answers inputN=active.
// The answer is read by SendHttpReqAndCheckLine, the Axis-family check (first match ends it).
//
// ZavioMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), lines "group=G;level=L;threshold=T;", judged as AxisMD judges them except
// that without motion the largest level of the part is reported. Cameras whose API is
// "zaviovga" count 0 to 1000: their level is capped at 1000 and divided by 10.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_ZAVIO_H_
#define EVWATCH_DETECTORS_ZAVIO_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class ZavioEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  ZavioEID(Camera* camera, int inputs);
  ~ZavioEID() override;

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

class ZavioMD : public DetectorBase {
 public:
  ZavioMD(Camera* camera, CameraAPI* api);
  ~ZavioMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read, no room for the part); motion and level are false and 0 then.
  // For a "zaviovga" API the level of a judged part is then min(level, 1000) / 10.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Scans one part body: 1 when a line's level is above its threshold, with that level;
  // else 0 with the largest level of all lines (0 when none; also for a negative length).
  int IsMotionDetected(char* body, int length, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; names the motion-data stream and the API
};

#endif  // EVWATCH_DETECTORS_ZAVIO_H_
