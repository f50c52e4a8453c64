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

#include "framework/detector.h"

class Camera;
class MultipartFetch;

class AIRLIVEV1EID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1; below 1 none is asked.
  AIRLIVEV1EID(Camera* camera, int inputs);
  ~AIRLIVEV1EID() override;

  // Asks inputs 1..inputs in order and stops at the first active one. An input whose
  // request fails counts as not active. -1 without a camera, else 0.
  int DoEID(bool& active);
  // Asks about one input and sets `active`. Returns 0.
  int QueryCamera(int input, bool& active);
  // Asks once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

class AirliveV1MD : public DetectorBase {
 public:
  explicit AirliveV1MD(Camera* camera);
  ~AirliveV1MD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read, no room for the part); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

#endif  // EVWATCH_DETECTORS_AIRLIVE_H_
