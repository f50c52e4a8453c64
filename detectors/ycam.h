// Y-cam network cameras: motion (YCAMMD), read once per bound interval from the camera's
// 8-byte binary status record at stream.arm: the levels of four motion areas and a motion
// flag for each.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_YCAM_H_
#define EVWATCH_DETECTORS_YCAM_H_

#include "framework/detector.h"

class Camera;

class YCAMMD : public DetectorBase {
 public:
  explicit YCAMMD(Camera* camera);
  ~YCAMMD() override;

  // One poll. Walks areas 0..3 keeping the largest level seen; the first flagged area sets
  // the state and ends the walk. Without a flag the level is the largest of the four and
  // the state false: a level the camera measured is reported even when it flagged nothing.
  // 0 on success, -1 when the request failed (a null camera included).
  int DoMD(bool& state, unsigned int& level);
  // Polls once per bound interval; a null camera fails every poll instead of ending the loop.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

#endif  // EVWATCH_DETECTORS_YCAM_H_
