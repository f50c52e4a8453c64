// Sony network cameras: the alarm data that the camera pushes at
// /command/alarmdata.cgi?interval=1 on its own port, a multipart stream whose parts hold
// lines "OdWinN=V" (object-detection windows) and "SensorN=V" (alarm inputs).
//
// SONYMD: motion (level 100) when a window's value, read as a number and written back as
// text, is "1" (so "01" counts). It judges every part as it comes.
// SONYEID: active when a sensor numbered at most `inputs` has the value 1 (read the same
// way). It reads one part a second.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_SONY_H_
#define EVWATCH_DETECTORS_SONY_H_

#include "framework/detector.h"

class Camera;
class MultipartFetch;

class SONYMD : public DetectorBase {
 public:
  explicit SONYMD(Camera* camera);
  ~SONYMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read); motion and level are false and 0 then.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
};

class SONYEID : public DetectorBase {
 public:
  // `inputs`: the highest sensor number watched (compared signed; sensors below 1 count too).
  SONYEID(Camera* camera, int inputs);
  ~SONYEID() override;

  // As SONYMD::DoMD, for the sensors.
  int DoEID(MultipartFetch* fetch, bool& active);
  // One part a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_SONY_H_
