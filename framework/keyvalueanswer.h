// The key/value question of the MessoaPro, Storage and Brickcom modules, written once: a GET
// of a path on a given port, one read of at most 8192 bytes, and a look-up of one key in
// that text (entries "key=value", one a line). Each module's GetHttpRespToBuf is this
// helper; the one difference between them, Storage's trailing ";", is the ValueForm.
//
// Also the alarm-status machine that MessoaPro and Storage share: one number whose two low
// bits stand for motion and input, the meaning of the bits being each module's own.
//
// Threads: everything here runs on the calling detector's worker thread; nothing is shared.

#ifndef EVWATCH_FRAMEWORK_KEYVALUEANSWER_H_
#define EVWATCH_FRAMEWORK_KEYVALUEANSWER_H_

#include <string>

#include "framework/detector.h"

class Camera;
class CameraAPI;

// What the helper does to a value it found.
enum class ValueForm {
  kAsFound,
  kFirstSemicolonDropped,  // Storage: the first ";" is removed, the rest kept ("1;" is "1")
};

// Asks path on the camera's host at `port` with the camera's credentials (time-out 10 s,
// any Content-Type) and looks `key` up in the first 8192 bytes of the answer with FindKeyVal
// ("=" and "\n"): a key beyond them is not seen. 0 with the value; -1 with value "" when
// the key is missing, and -1 (value untouched) on a failed request or an empty answer,
// a null camera included.
int GetKeyValueAnswer(Camera* camera, const std::string& path, int port, const std::string& key,
                      std::string& value, ValueForm form);

// One module's reading of its alarm-status number. 3 means both events in every module.
struct AlarmStatusForm {
  const char* key;      // the key of the number in the answer
  long motion;          // the number that means motion alone
  long input;           // the number that means input alone
  ValueForm value_form;
};

// The status request: the path and port that the CameraAPI gives (port 80 when it gives
// none), the form's key, its number through strtol (not a number reads as 0).
// 0 with the number, -1 on failure (null camera or API included).
int GetAlarmStatus(Camera* camera, CameraAPI* api, const AlarmStatusForm& form, long& number);

// The motion detector of the family: motion (level 100) while the number means motion or
// both; polls once per bound interval, also without a camera (every pass then fails).
class AlarmStatusMD : public DetectorBase {
 public:
  // 0 with a reading, -1 on failure.
  int DoMD(bool& detected, unsigned int& level);
  int EventDetecor() override;

 protected:
  // REQUIRES: form outlives the detector.
  AlarmStatusMD(Camera* camera, CameraAPI* api, const AlarmStatusForm& form);

 private:
  Camera* camera_;               // not owned
  CameraAPI* api_;               // not owned; names the status CGI
  const AlarmStatusForm& form_;
};

// The input detector of the family: active while the number means input or both; polls once
// per bound interval and reports validity 1 with each reading; without a camera it ends at
// once and reports nothing.
class AlarmStatusEID : public DetectorBase {
 public:
  // 0 with a reading, -1 on failure.
  int DoEID(bool& active);
  int EventDetecor() override;

 protected:
  // `unused` is the constructor's int, kept and not read. REQUIRES: form outlives the
  // detector.
  AlarmStatusEID(Camera* camera, CameraAPI* api, int unused, const AlarmStatusForm& form);

 private:
  Camera* camera_;               // not owned
  CameraAPI* api_;               // not owned; names the status CGI
  [[maybe_unused]] int unused_;  // given by the host, not read
  const AlarmStatusForm& form_;
};

#endif  // EVWATCH_FRAMEWORK_KEYVALUEANSWER_H_
