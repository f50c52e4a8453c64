// Sanyo network cameras: motion (SanyoMD) and alarm inputs (SanyoEID), both read once a
// second from the camera's 48-byte binary status record: byte 34 carries the motion bit
// (bit 1), byte 33 the inputs (bit N-1 for input N).
//
// The status CGI's path is the model's: each poll takes it from the camera's CameraAPI
// (GetStreamPath; its port output is not used, the request goes to the camera's own port).
// A GetStreamPath that fails fails the poll.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the run.

#ifndef EVWATCH_DETECTORS_SANYO_H_
#define EVWATCH_DETECTORS_SANYO_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;

class SanyoMD : public DetectorBase {
 public:
  SanyoMD(Camera* camera, CameraAPI* api);
  ~SanyoMD() override;

  // One poll: motion, level 100, while the motion byte's bit 1 is set; else level 0.
  // 0 on success, -1 when the request failed or the camera or its API is missing.
  int DoMD(bool& state, unsigned int& level);
  // Whether bit 1 (value 2) of the motion byte is set; level 100 then, else 0.
  bool IsMotionDetected(char status, unsigned int& level);
  // Polls once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; gives the status path
};

class SanyoEID : public DetectorBase {
 public:
  // `inputs`: how many inputs to watch, counted from 1; below 1 never active.
  SanyoEID(Camera* camera, CameraAPI* api, int inputs);
  ~SanyoEID() override;

  // One poll: active, level 100, while one of the watched inputs' bits is set; else level
  // 0. Reported like a motion reading. 0 on success, -1 when the request failed or the
  // camera or its API is missing.
  int DoEID(bool& state, unsigned int& level);
  // Whether one of bits 0..inputs-1 of the input byte is set; level 100 then, else 0.
  bool IsEventDetected(char status, unsigned int& level);
  // Polls once a second; a null camera fails every poll instead of ending the loop.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned; gives the status path
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_SANYO_H_
