// Vivotek network cameras: the digital inputs (VivotekEID), asked one by one at the
// camera's input CGI once per bound interval, up to the first active input. (Vivotek's
// motion, carried in JPEG headers, is VivotekJpgMD in detectors/media.)
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_VIVOTEK_H_
#define EVWATCH_DETECTORS_VIVOTEK_H_

#include "framework/detector.h"
#include "framework/host/hosttypes.h"

class Camera;

class VivotekEID : public DetectorBase {
 public:
  // `group` chooses the firmware's request form: 0 and 1 ask cgi-bin/getdi.cgi?diN for N =
  // 1..inputs and look for DIN=H; 2 and 3 ask cgi-bin/dido/getdi.cgi?diN for N =
  // 0..inputs-1 and look for diN=1. Any other group cannot be read.
  VivotekEID(Camera* camera, VIVO_FUNC_GR group, int inputs);
  ~VivotekEID() override;

  // Asks the inputs in order and stops at the first active one; an input whose request
  // fails counts as inactive. 0 for a reading (a count below 1 asks nothing and leaves
  // `active` as it was); -1, with `active` false, for an unknown group.
  int DoEID(bool& active);
  // Paced by the bound interval; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  VIVO_FUNC_GR group_;
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_VIVOTEK_H_
