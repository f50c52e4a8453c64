// Brickcom network cameras: BrickcomEID asks cgi-bin/gpio.cgi?action=get on the camera's own
// port for di1.status, di2.status, ... in turn, one request each, and stops at the first
// input whose status is "0": an input reads active at "0" and idle at anything else.
//
// Its loop has no pacing timer: passes follow each other back to back, paced only by the
// camera's answers. With an input count below 1 a pass asks nothing and reports (false, 1)
// at once, so such a detector keeps its thread busy reporting.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the run.

#ifndef EVWATCH_DETECTORS_BRICKCOM_H_
#define EVWATCH_DETECTORS_BRICKCOM_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;

class BrickcomEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked. The CameraAPI
  // is not asked for anything, but the loop runs only with one.
  BrickcomEID(Camera* camera, CameraAPI* api, int inputs);
  ~BrickcomEID() override;

  // Asks inputs 1..inputs in order up to the first active one. 0 with a reading (a count
  // below 1 reads idle without a request); -1 as soon as one request fails, whatever the
  // inputs before it said.
  int DoEID(bool& active);
  // Without a camera or a CameraAPI it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; only its presence is checked
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_BRICKCOM_H_
