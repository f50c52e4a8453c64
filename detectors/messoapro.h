// MessoaPro network cameras: the alarm status, asked once per bound interval at the status
// CGI that the camera's CameraAPI names, is the number after "Alarm.Status=": 1 means input,
// 2 motion, 3 both; any other number (0, or above 3) neither.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the run.

#ifndef EVWATCH_DETECTORS_MESSOAPRO_H_
#define EVWATCH_DETECTORS_MESSOAPRO_H_

#include "framework/keyvalueanswer.h"

class MessoaProMD : public AlarmStatusMD {
 public:
  MessoaProMD(Camera* camera, CameraAPI* api);
  ~MessoaProMD() override;
};

class MessoaProEID : public AlarmStatusEID {
 public:
  // The int is kept and not read: the status number carries a single input.
  MessoaProEID(Camera* camera, CameraAPI* api, int inputs);
  ~MessoaProEID() override;
};

#endif  // EVWATCH_DETECTORS_MESSOAPRO_H_
