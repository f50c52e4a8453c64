// AVIPC network cameras.
//
// AVIPCEID: the camera's alarm inputs, asked once a second one by one at
// cgi-bin/io/input.cgi?checkactive=N; active while some input N answers inputN=active.
// The answer is read by the shared key/value check (SendHttpReqAndCheckResp).
//
// AvipcMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), lines "group=G;level=L;threshold=T;", judged as AxisMD judges them.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_AVIPC_H_
#define EVWATCH_DETECTORS_AVIPC_H_

#include "framework/inputquery.h"
#include "framework/motiondata.h"

class AVIPCEID : public InputQueryEID {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AVIPCEID(Camera* camera, int inputs);
  ~AVIPCEID() override;
};

class AvipcMD : public MotionDataMD {
 public:
  AvipcMD(Camera* camera, CameraAPI* api);
  ~AvipcMD() override;
};

#endif  // EVWATCH_DETECTORS_AVIPC_H_
