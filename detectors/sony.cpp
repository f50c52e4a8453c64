#include "detectors/sony.h"

#include <cstdio>

#include "framework/host/camera.h"
#include "framework/host/textutil.h"
#include "framework/motiondata.h"
#include "framework/readline.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

const char kAlarmDataPath[] = "/command/alarmdata.cgi?interval=1";

// The camera writes a value as it likes ("01" too); a value is on when it reads as 1.
bool IsOne(int value) { return itos(value) == "1"; }

// 1 when a line "OdWinN=V" has V on. A window line that sets no value keeps the previous
// line's; a line that ends before its first field ends the scan.
int FindWindowOn(const char* text, int length) {
  int value = 0;
  return ScanLines(text, length, [&value](const char* line) {
    int window = 0;
    if (sscanf(line, "OdWin%d=%d", &window, &value) == EOF) return LineVerdict::kEnd;
    return IsOne(value) ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

// 1 when a line "SensorN=V" with N <= inputs has V on.
int FindSensorOn(const char* text, int length, int inputs) {
  return ScanLines(text, length, [inputs](const char* line) {
    int sensor = 0;
    int value = 0;
    if (sscanf(line, "Sensor%d=%d", &sensor, &value) == EOF) return LineVerdict::kEnd;
    return sensor <= inputs && IsOne(value) ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

}  // namespace

SONYMD::SONYMD(Camera* camera) : camera_(camera) {}

SONYMD::~SONYMD() { StopIfStarted(); }

int SONYMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [](char* text, int length, unsigned int& found) {
    if (FindWindowOn(text, length) == 0) return false;
    found = 100;
    return true;
  });
}

int SONYMD::EventDetecor() {
  RunFixedMotionDataLoop(*this, event_buffer_, camera_, kAlarmDataPath,
                         [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                           return DoMD(fetch, motion, level);
                         });
  return 0;
}

SONYEID::SONYEID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

SONYEID::~SONYEID() { StopIfStarted(); }

int SONYEID::DoEID(MultipartFetch* fetch, bool& active) {
  return ReadJudgedPart(fetch, StreamPart::Shape{}, active, [this](char* text, int length) {
    return FindSensorOn(text, length, inputs_) != 0;
  });
}

int SONYEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  StreamLoopShape loop;
  loop.period = kOneSecond;
  RunInputStreamLoop(*this, event_buffer_, *camera_, kAlarmDataPath, camera_->GetPort(), loop,
                     [this](MultipartFetch* fetch, bool& active) { return DoEID(fetch, active); });
  return 0;
}
