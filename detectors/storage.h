// The storage boxes of the StorageMD and StorageEID classes: the alarm status, asked once per
// bound interval at the status CGI that the box's CameraAPI names, is the number after
// "alarm_status=", whose first ";" is dropped ("1;" reads 1). Its bits are the other way
// round from MessoaPro's: 1 means motion, 2 input, 3 both; any other number neither.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the run.

#ifndef EVWATCH_DETECTORS_STORAGE_H_
#define EVWATCH_DETECTORS_STORAGE_H_

#include "framework/keyvalueanswer.h"

class StorageMD : public AlarmStatusMD {
 public:
  StorageMD(Camera* camera, CameraAPI* api);
  ~StorageMD() override;
};

class StorageEID : public AlarmStatusEID {
 public:
  // The int is kept and not read: the status number carries a single input.
  StorageEID(Camera* camera, CameraAPI* api, int inputs);
  ~StorageEID() override;
};

#endif  // EVWATCH_DETECTORS_STORAGE_H_
