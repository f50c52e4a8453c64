// Axis network cameras.
//
// AXISEID: the camera's alarm inputs, asked once a second one by one at
// axis-cgi/io/input.cgi?checkactive=N; active while some input N answers inputN=active.
// The answer is read by SendHttpReqAndCheckLine, the Axis-family check (first match ends it).
//
// AxisMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), a multipart stream whose parts hold lines
// "group=G;level=L;threshold=T;". A part is motion when some line's level is above its
// threshold (compared unsigned); the level reported is that line's, or without motion the
// last line's. AvipcMD, ZavioMD and AirliveV1MD read the same data.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_AXIS_H_
#define EVWATCH_DETECTORS_AXIS_H_

#include "framework/inputquery.h"
#include "framework/motiondata.h"

class AXISEID : public InputQueryEID {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AXISEID(Camera* camera, int inputs);
  ~AXISEID() override;
};

class AxisMD : public MotionDataMD {
 public:
  AxisMD(Camera* camera, CameraAPI* api);
  ~AxisMD() override;
};

#endif  // EVWATCH_DETECTORS_AXIS_H_
