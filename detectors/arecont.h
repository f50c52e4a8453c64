// Arecont network cameras: ARECONTMD asks, once a second, the CGI that the camera's
// CameraAPI names for the value of "mdresult" (the shared key/value helper,
// SendHttpReqAndGetResp) and reports motion whenever that value does not contain "no".
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the run.

#ifndef EVWATCH_DETECTORS_ARECONT_H_
#define EVWATCH_DETECTORS_ARECONT_H_

#include <string>

#include "framework/detector.h"

class Camera;
class CameraAPI;

class ARECONTMD : public DetectorBase {
 public:
  ARECONTMD(Camera* camera, CameraAPI* api);
  ~ARECONTMD() override;

  // One reading from the API's path (its port is not used: the request goes to the
  // camera's). 0 with a reading, -1 on failure (null camera or API, failed request), the
  // outputs then left as they were. An answer that is read whole but holds no "mdresult"
  // leaves the value empty, which reads as motion.
  int DoMD(bool& detected, unsigned int& level);
  // 1 and level 100 when value does not contain "no" (case as written; an empty value
  // included), else 0 and level 0.
  int IsMotionDetected(std::string value, unsigned int& level);
  // Polls once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; names the motion CGI
};

#endif  // EVWATCH_DETECTORS_ARECONT_H_
