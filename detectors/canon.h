// Canon network cameras: motion (CanonMD) and alarm inputs (CanonEID), both read once a
// second from the plain-text lines (name:=value) of the camera's info CGI.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_CANON_H_
#define EVWATCH_DETECTORS_CANON_H_

#include "framework/detector.h"

class Camera;

class CanonMD : public DetectorBase {
 public:
  explicit CanonMD(Camera* camera);
  ~CanonMD() override;

  // One poll: motion when the last "m.1:=" line says 1; level 100 then, else 0.
  // 0 on success, -1 when the request failed.
  int DoMD(bool& state, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

class CanonEID : public DetectorBase {
 public:
  // `input` seeds the parse only: any input the camera reports as 1 makes it active.
  CanonEID(Camera* camera, int input);
  ~CanonEID() override;

  // One poll: active when an "i.N:=1" line with N >= 1 is found.
  // 0 on success, -1 when the request failed.
  int DoEID(bool& state);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int input_;
};

#endif  // EVWATCH_DETECTORS_CANON_H_
