// IQeye network cameras.
//
// IQeyeV2MD: motion from the motion data that the camera pushes at now.motiondata on its own
// port, a multipart stream whose parts hold lines "window=N;level=L;threshold=T". A part is
// motion when some window's level is above its threshold (compared unsigned); the level
// reported is that window's, or without motion the last line's.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_IQEYE_H_
#define EVWATCH_DETECTORS_IQEYE_H_

#include "framework/motiondata.h"

class IQeyeV2MD : public MotionDataMD {
 public:
  explicit IQeyeV2MD(Camera* camera);
  ~IQeyeV2MD() override;
};

#endif  // EVWATCH_DETECTORS_IQEYE_H_
