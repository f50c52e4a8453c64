// IQeye network cameras.
//
// IQeyeV2MD: motion from the motion data that the camera pushes at now.motiondata on its own
// port, a multipart stream whose parts hold lines "window=N;level=L;threshold=T". A part is
// motion when some window's level is above its threshold (compared unsigned); the level
// reported is that window's, or without motion the last line's.
//
// IQeyeV1MD and IQeyeV2EID: the camera's server push of pictures (now.jpg with snap=spush
// on its own port), after each of which it sends lines "Pragma: trigger=T". Those lines are
// copied over the start of the picture's buffer and the buffer is scanned for the part's
// length: motion when a trigger text holds "motion" (level 100), an active input when one
// holds "input", whatever input it names. The motion detector judges every part as it
// comes; the input detector reads one part a second.
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

class IQeyeV1MD : public DetectorBase {
 public:
  explicit IQeyeV1MD(Camera* camera);
  ~IQeyeV1MD() override;

  // Reads one part with its trailing lines and judges them. 0 when a part was read and
  // judged, -1 otherwise (no fetcher, a failed read); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

class IQeyeV2EID : public DetectorBase {
 public:
  // `inputs` is kept but selects nothing: a trigger for any input counts.
  IQeyeV2EID(Camera* camera, int inputs);
  ~IQeyeV2EID() override;

  // As IQeyeV1MD::DoMD, looking for an input trigger.
  int DoEID(MultipartFetch* fetch, bool& active);
  // One part a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;               // not owned
  [[maybe_unused]] int inputs_;  // as given; unused by design
};

#endif  // EVWATCH_DETECTORS_IQEYE_H_
