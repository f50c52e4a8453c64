// D-Link network cameras: motion (DLinkMD) and alarm inputs (DLINKEID), both read from the
// key=value lines of the camera's config/notify.cgi.
//
// DLinkMD asks once per bound interval and reports the camera's own motion value (mdv1)
// while md1=on. DLINKEID asks once a second, one request per input from input 1 up to the
// first one whose line says inputN=on.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_DLINK_H_
#define EVWATCH_DETECTORS_DLINK_H_

#include "framework/detector.h"

class Camera;

class DLinkMD : public DetectorBase {
 public:
  explicit DLinkMD(Camera* camera);
  ~DLinkMD() override;

  // One poll: state while the first line says md1=on, with the level of the mdv1 line that
  // follows it as the camera gives it; else no motion, level 0.
  // 0 on success, -1 when the request failed (a null camera included).
  int DoMD(bool& state, unsigned int& level);
  // Polls once per bound interval; a null camera fails every poll instead of ending the loop.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

class DLINKEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  DLINKEID(Camera* camera, int inputs);
  ~DLINKEID() override;

  // One request per input, 1..inputs in order, up to the first that is on. Any failed
  // request fails the whole poll. -1 on failure or without a camera, else 0.
  int DoEID(bool& state);
  // Polls once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_DLINK_H_
