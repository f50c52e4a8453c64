// Pixord network cameras.
//
// PIXORDMD: motion from the motion data that the camera pushes at the stream its CameraAPI
// names, lines "group=G;level=L;sensitivity=S;". The threshold is not in the lines: it is
// the second of the API's motion parameters, read once when the worker thread starts (a
// change takes effect at the next start). A part is motion when a line's level is above it,
// compared signed; the level reported is that line's, or without motion the last line's.
// The sensitivity the camera sends is not used.
//
// PIXORDEID: the camera's alarm inputs, asked once a second one by one (counted from 0) at
// /cgi-bin/admin/sm.cgi?actions=listgroup&Input, looking for "Input.I0N.Status=high" (the
// 0 before N is always there, also for N >= 10); stops at the first active input.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the
// detector's run.

#ifndef EVWATCH_DETECTORS_PIXORD_H_
#define EVWATCH_DETECTORS_PIXORD_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class PIXORDMD : public DetectorBase {
 public:
  PIXORDMD(Camera* camera, CameraAPI* api);
  ~PIXORDMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Scans one part body: 1 at the first line whose level is above the threshold (signed),
  // with that level; else 0 with the last non-empty line's level (0 when it did not
  // match). A line that ends before its first field ends the scan. A negative length
  // returns 0 and leaves `level` alone.
  int IsMotionDetected(char* body, int length, unsigned int& level);
  // Reads the threshold, then follows the API's stream; without a camera, an API or a
  // stream it ends at once and reports nothing.
  int EventDetecor() override;

  // The threshold in use: 0 until the worker thread has read it.
  int Threshold() const { return threshold_; }

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
  int threshold_;   // written by the worker thread before its stream opens
};

class PIXORDEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 0; below 1 none is asked.
  PIXORDEID(Camera* camera, int inputs);
  ~PIXORDEID() override;

  // Asks inputs 0..inputs-1 in order and stops at the first active one. An input whose
  // request fails counts as not active. -1 without a camera, else 0.
  int DoEID(bool& active);
  // Asks once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_PIXORD_H_
