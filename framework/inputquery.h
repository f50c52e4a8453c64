// The digital-input query that the Axis, AVIPC, AirLive and Zavio input detectors share: once a
// second, ask the camera's input CGI about input 1, 2, ... (path prefix + N) and look in its
// text answer for the line "inputN=active", stopping at the first active input.
//
// The classes differ only in the path prefix and in the request routine: AVIPC and AirLive
// use the shared SendHttpReqAndCheckResp, Axis and Zavio SendHttpReqAndCheckLine below. The
// scan and the loop are written here once; each class keeps its own members that call them.
//
// Threads: everything here runs on the calling detector's worker thread; nothing is shared.

#ifndef EVWATCH_FRAMEWORK_INPUTQUERY_H_
#define EVWATCH_FRAMEWORK_INPUTQUERY_H_

#include <string>

#include "framework/detector.h"
#include "framework/host/textutil.h"
#include "framework/polledloop.h"

class Camera;
class EventBuf;

// The Axis-family request routine: true when, within the first 10 lines of the camera's text
// answer to path (empty lines counted), a line's key begins with `key` and its value begins
// with `value`, both compared without regard to case; reading stops at the first match.
// False on every failure. Time-out 10 s.
bool SendHttpReqAndCheckLine(Camera* camera, std::string path, std::string key,
                             std::string value);

// One input's question: GET prefix + N and look for the key "input" + N with the value
// "active". `routine` is SendHttpReqAndCheckLine or SendHttpReqAndCheckResp. A failed request
// counts as not active. Returns 0.
template <typename Routine>
int QueryInput(Camera* camera, const char* prefix, int input, bool& active, Routine routine) {
  const std::string number = itos(input);
  active = routine(camera, prefix + number, "input" + number, "active") != 0;
  return 0;
}

// Asks inputs 1..count in order through query(input, active) and stops at the first that
// leaves `active` true. -1 without a camera, else 0 (a count below 1 asks nothing).
template <typename Query>
int ScanInputs(Camera* camera, int count, bool& active, Query&& query) {
  if (camera == nullptr) return -1;
  active = false;
  for (int input = 1; input <= count; ++input) {
    query(input, active);
    if (active) break;
  }
  return 0;
}

// The input detectors' worker loop: nothing at all without a camera, else a reading per
// second through doEid(active), reported with validity 1 (or (false, 0) when it failed).
template <typename DoEid>
int RunInputQueryLoop(DetectorBase& detector, EventBuf* buffer, Camera* camera,
                      DoEid&& doEid) {
  if (camera == nullptr) return 0;
  RunInputPolledLoop(detector, buffer, kOneSecond, doEid);
  return 0;
}

#endif  // EVWATCH_FRAMEWORK_INPUTQUERY_H_
