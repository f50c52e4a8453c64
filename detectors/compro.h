// COMPRO network cameras: motion (COMPROMD), read once a second from the first line of the
// camera's motion-detection parameter list: motion while it begins with "Region:0".
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_COMPRO_H_
#define EVWATCH_DETECTORS_COMPRO_H_

#include "framework/detector.h"

class Camera;

class COMPROMD : public DetectorBase {
 public:
  explicit COMPROMD(Camera* camera);
  ~COMPROMD() override;

  // One poll: motion (level 100) when the answer's first line begins with "Region:0",
  // compared without regard to case; later lines are not read. 0 on success, -1 when the
  // request failed or there is no camera.
  int DoMD(bool& state, unsigned int& level);
  // Polls once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

#endif  // EVWATCH_DETECTORS_COMPRO_H_
