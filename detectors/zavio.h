// Zavio network cameras.
//
// ZavioEID: the camera's alarm inputs, asked once a second one by one at
// cgi-bin/admin/input?checkactive=N; active while some input N answers inputN=active.
// The answer is read by SendHttpReqAndCheckLine, the Axis-family check (first match ends it).
//
// ZavioMD: motion from the motion data that the camera pushes (the stream that the camera's
// CameraAPI names), lines "group=G;level=L;threshold=T;", judged as AxisMD judges them except
// that without motion the largest level of the part is reported. Cameras whose API is
// "zaviovga" count 0 to 1000: their level is capped at 1000 and divided by 10.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_ZAVIO_H_
#define EVWATCH_DETECTORS_ZAVIO_H_

#include "framework/inputquery.h"
#include "framework/motiondata.h"

class ZavioEID : public InputQueryEID {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  ZavioEID(Camera* camera, int inputs);
  ~ZavioEID() override;
};

class ZavioMD : public MotionDataMD {
 public:
  ZavioMD(Camera* camera, CameraAPI* api);
  ~ZavioMD() override;

  // The shared reading, then the "zaviovga" levels capped at 1000 and divided by 10.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) override;
};

#endif  // EVWATCH_DETECTORS_ZAVIO_H_
