// JVC network cameras: the alarm inputs (JVCEID), asked pin by pin at the camera's parameter
// API once a second, up to the first active pin. (JVC's motion, carried in JPEG headers, is
// JVCJpgMD in detectors/media.)
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_JVC_H_
#define EVWATCH_DETECTORS_JVC_H_

#include "framework/detector.h"

class Camera;

class JVCEID : public DetectorBase {
 public:
  // `inputs`: how many input pins to ask, counted from 1.
  JVCEID(Camera* camera, int inputs);
  ~JVCEID() override;

  // Asks /api/param?peripheral.input_pin.pin(N).status for N = 1..inputs in order and stops
  // at the first pin whose line says make&200; a pin whose request fails counts as
  // inactive. -1 without a camera, else 0 (a count below 1 asks nothing).
  int DoEID(bool& active);
  // Asks once a second (the bound interval is not used); without a camera it ends at once
  // and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_JVC_H_
