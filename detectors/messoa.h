// Messoa network cameras: motion (MessoaMD) and alarm inputs (MessoaEID), both read once per
// bound interval from the one "Mode" value of the camera's alarm-status parameters, whose
// code says whether motion, an input, or both have triggered.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_MESSOA_H_
#define EVWATCH_DETECTORS_MESSOA_H_

#include "framework/detector.h"

class Camera;

class MessoaMD : public DetectorBase {
 public:
  // REQUIRES: camera is not null for a started detector (each pass then fails).
  explicit MessoaMD(Camera* camera);
  ~MessoaMD() override;

  // One poll: motion (level 100) while Mode is exactly 2 or 3, else none (level 0), a
  // missing Mode included. 0 for a reading, -1 when the request failed.
  int DoMD(bool& state, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

class MessoaEID : public DetectorBase {
 public:
  // `inputs` is kept but not read: every input of the camera shares the one status value.
  MessoaEID(Camera* camera, int inputs);
  ~MessoaEID() override;

  // One poll: active while Mode is exactly 1 or 3, else inactive, a missing Mode included.
  // 0 for a reading, -1 when the request failed.
  int DoEID(bool& active);
  // Without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_MESSOA_H_
