// The digital-input query that the Axis, AVIPC, AirLive and Zavio input detectors share: once a
// second, ask the camera's input CGI about input 1, 2, ... (path prefix + N) and look in its
// text answer for the line "inputN=active", stopping at the first active input.
//
// The classes differ only in the path prefix and in the request routine: AVIPC and AirLive
// use the shared SendHttpReqAndCheckResp, Axis and Zavio SendHttpReqAndCheckLine below. The
// machine is InputQueryEID; each maker's class is that machine with its own prefix and check.
//
// Threads: everything here runs on the calling detector's worker thread; nothing is shared.

#ifndef EVWATCH_FRAMEWORK_INPUTQUERY_H_
#define EVWATCH_FRAMEWORK_INPUTQUERY_H_

#include <string>

#include "framework/detector.h"

class Camera;

// The Axis-family request routine: true when, within the first 10 lines of the camera's text
// answer to path (empty lines counted), a line's key begins with `key` and its value begins
// with `value`, both compared without regard to case; reading stops at the first match.
// False on every failure. Time-out 10 s.
bool SendHttpReqAndCheckLine(Camera* camera, std::string path, std::string key,
                             std::string value);

// Which check reads an input's answer.
enum class InputAnswerCheck {
  kLine,      // SendHttpReqAndCheckLine, the Axis-family line check
  kKeyValue,  // SendHttpReqAndCheckResp, the shared key/value check
};

// The family's input detector, written once; each maker's class names its path prefix and
// its check. Once a second it asks inputs 1..inputs in order (GET prefix + N, looking for
// the key "input" + N with the value "active") and stops at the first active one.
class InputQueryEID : public DetectorBase {
 public:
  // Asks inputs 1..inputs in order and stops at the first active one. An input whose
  // request fails counts as not active. -1 without a camera, else 0 (a count below 1 asks
  // nothing).
  int DoEID(bool& active);
  // Asks about one input and sets `active`. Returns 0.
  int QueryCamera(int input, bool& active);
  // Asks once a second; without a camera it ends at once and reports nothing.
  int EventDetecor() override;

 protected:
  // `inputs`: how many inputs to ask, counted from 1. `prefix` is a string literal.
  InputQueryEID(Camera* camera, int inputs, const char* prefix, InputAnswerCheck check);

 private:
  Camera* camera_;  // not owned
  int inputs_;
  const char* prefix_;
  InputAnswerCheck check_;
};

#endif  // EVWATCH_FRAMEWORK_INPUTQUERY_H_
