// LevelOne network cameras: motion (LevelOneGr2MD), judged here from the camera's
// motion-window settings and the live readings of its three windows, and the alarm inputs
// (LevelOneGr1EID). Both poll once per bound interval.
//
// The window readings come over a plain TCP connection to port 19999 of the camera's host,
// a port the camera fixes: it is not the camera's HTTP port and cannot be configured.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. A detector's readings and window records belong to whichever thread
// reads (the worker while started). The Camera is the host's and must outlive the
// detector's run.

#ifndef EVWATCH_DETECTORS_LEVELONE_H_
#define EVWATCH_DETECTORS_LEVELONE_H_

#include "framework/detector.h"

class Camera;

class LevelOneGr2MD : public DetectorBase {
 public:
  // The camera's TCP port of the window readings.
  static constexpr int kReadingPort = 19999;

  // One motion window's settings as the camera last gave them.
  struct MotionWindow {
    bool enabled;
    int sensitivity;  // read and kept; the judgement does not use it
    unsigned int threshold;
    int left, top, right, bottom;  // read and kept; the judgement does not use them
  };

  explicit LevelOneGr2MD(Camera* camera);
  ~LevelOneGr2MD() override;

  // Reads the motion-window settings (lines such as M1.Threshold=30) into the window
  // records, which are cleared first. A window is enabled unless its Enabled value is
  // exactly "no". 0, or -1 when the request failed (a null camera included).
  int GetMotionWin();
  // One poll: the settings, then one reading line (R1=..,R2=..,R3=..) from port 19999. For
  // each enabled window in order the level becomes the larger of itself and the window's
  // reading, capped at 1000 and divided by 10; a reading above the window's threshold is
  // motion. 0 for a reading; -1 when the settings, the connection or the line failed.
  int DoMD(bool& state, unsigned int& level);
  // Paced by the bound interval. A null camera is not checked here: each pass fails.
  int EventDetecor() override;

  // Window w (0..2) as the last settings read left it. REQUIRES: 0 <= w < 3.
  const MotionWindow& Window(int w) const { return windows_[w]; }

 private:
  static constexpr int kLineSize = 1024;

  Camera* camera_;                // not owned
  char line_[kLineSize];          // the settings lines and the reading line, in turn
  MotionWindow windows_[3];       // M0, M1, M2; cleared at every settings read
};

class LevelOneGr1EID : public DetectorBase {
 public:
  // `inputs`: how many inputs to ask, counted from 1.
  LevelOneGr1EID(Camera* camera, int inputs);
  ~LevelOneGr1EID() override;

  // Asks io/query_io.cgi for input_1 .. input_<inputs>, every one every time, and leaves
  // in `state` the answer about the last (so the reading is that of the last input). A
  // failed request reads as inactive. Always 0; a count below 1 asks nothing and leaves
  // `state`.
  int DoEID(bool& state);
  // Paced by the bound interval; every pass is a valid reading. A null camera is not
  // checked here: each input then reads as inactive.
  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int inputs_;
};

#endif  // EVWATCH_DETECTORS_LEVELONE_H_
