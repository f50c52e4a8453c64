// Etrovision network cameras: an event stream at the path and port that the camera's
// CameraAPI names, a multipart stream of text parts (read with a 256-byte part-header
// buffer, as these cameras send long part headers).
//
// ETROVISIONMD: motion (level 100) while a line begins with "md1=on", in any case.
// ETROVISIONEID: active while a line "inputN=V" has N <= `inputs` (signed, so numbers below
// 1 count too) and V beginning with "on", in any case; higher inputs are ignored.
//
// Both judge every part as it comes.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the
// detector's run.

#ifndef EVWATCH_DETECTORS_ETROVISION_H_
#define EVWATCH_DETECTORS_ETROVISION_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class ETROVISIONMD : public DetectorBase {
 public:
  ETROVISIONMD(Camera* camera, CameraAPI* api);
  ~ETROVISIONMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Without a camera, an API or a stream from it, it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
};

class ETROVISIONEID : public DetectorBase {
 public:
  ETROVISIONEID(Camera* camera, CameraAPI* api, int inputs);
  ~ETROVISIONEID() override;

  // As ETROVISIONMD::DoMD, for the inputs; level is 100 while active, else 0. The loop
  // reports (active, 1) for a reading and (false, 0) for a failure.
  int DoEID(MultipartFetch* fetch, bool& active, unsigned int& level);
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
  int inputs_;      // the highest input number watched
};

#endif  // EVWATCH_DETECTORS_ETROVISION_H_
