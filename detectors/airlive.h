// AirLive network cameras.
//
// AIRLIVEV1EID: the camera's alarm inputs, asked once a second one by one at
// io/input.cgi?checkactive=N; active while some input N answers inputN=active.
// The answer is read by the shared key/value check (SendHttpReqAndCheckResp).
//
// AirliveV1MD: motion from the motion data that the camera pushes at motion/motiondata.cgi
// on its own port, lines "group=N;level=L;threshold=T;" with a numeric group, judged as
// AxisMD judges them.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_AIRLIVE_H_
#define EVWATCH_DETECTORS_AIRLIVE_H_

#include "framework/inputquery.h"
#include "framework/motiondata.h"

class AIRLIVEV1EID : public InputQueryEID {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AIRLIVEV1EID(Camera* camera, int inputs);
  ~AIRLIVEV1EID() override;
};

class AirliveV1MD : public MotionDataMD {
 public:
  explicit AirliveV1MD(Camera* camera);
  ~AirliveV1MD() override;
};

#endif  // EVWATCH_DETECTORS_AIRLIVE_H_
