// Panasonic network cameras that push their state as a multipart stream of short text
// lines, at the path and port that the camera's CameraAPI names (read with a 20-second
// time-out). Both detectors judge every part as it comes.
//
// PanaMD: motion (level 100) while a line gives the state letter T: "motiondetect T" for
// channel "1", "motiondetect chNT" (no blank before the letter) for any other channel N.
// PanaEID: active while a line "terminalN I L" names a watched input N (1..inputs); H is
// idle. Without a stream from the API it goes on with an empty path on port 80, so it keeps
// reporting failed readings instead of falling silent.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera and CameraAPI are the host's and must outlive the
// detector's run.

#ifndef EVWATCH_DETECTORS_PANASONIC_H_
#define EVWATCH_DETECTORS_PANASONIC_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;

class PanaMD : public DetectorBase {
 public:
  PanaMD(Camera* camera, CameraAPI* api);
  ~PanaMD() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read); detected and level are false and 0 then. Asks the API for its
  // stream again first and drops the answer, as these cameras' drivers expect of it.
  int DoMD(MultipartFetch* fetch, bool& detected, unsigned int& level);
  // 1 with level 100 when a line of text[0, length) gives the state letter T for the
  // camera's channel; else 0. A line that ends before the letter ends the scan.
  int IsMotionDetected(char* text, int length, unsigned int& level);
  // Without a camera, an API or a stream from it, it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
};

class PanaEID : public DetectorBase {
 public:
  // `inputs`: the inputs watched, numbered from 1; below 1 none is.
  PanaEID(Camera* camera, CameraAPI* api, int inputs);
  ~PanaEID() override;

  // Reads one part and judges it. 0 when a part was read and judged, -1 otherwise (no
  // fetcher, a failed read); active is false then.
  int DoEID(MultipartFetch* fetch, bool& active);
  // Sets active when a line of text[0, length) gives a watched input the letter L; leaves
  // it alone otherwise.
  void QueryCamera(char* text, int length, bool& active);
  // Without a camera or an API it ends at once and reports nothing.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  CameraAPI* api_;  // not owned
  int inputs_;      // inputs 1..inputs_ are watched
};

#endif  // EVWATCH_DETECTORS_PANASONIC_H_
