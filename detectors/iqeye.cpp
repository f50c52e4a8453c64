#include "detectors/iqeye.h"

#include <cstdio>
#include <cstring>

#include "framework/readline.h"

namespace {

const char kMotionDataPath[] = "now.motiondata";
const char kMotionPushPath[] = "now.jpg?snap=spush&pragma=motion";
const char kTriggerPushPath[] = "now.jpg?snap=spush&pragma=trigger&noimage";

// The trigger lines follow the picture, so the part is read with the text after its body.
StreamPart::Shape TriggerShape() {
  StreamPart::Shape shape;
  shape.extra = StreamPart::Extra::kAfter;
  return shape;
}

// 1 when a line "Pragma: trigger=T" of text[0, length) has `wanted` somewhere in T (the
// value's first 63 characters). A line that ends before the value ends the scan.
int FindTrigger(const char* text, int length, const char* wanted) {
  return ScanLines(text, length, [wanted](const char* line) {
    char trigger[64];
    memset(trigger, 0, sizeof(trigger));
    if (sscanf(line, "Pragma: trigger=%63s", trigger) == EOF) return LineVerdict::kEnd;
    return strstr(trigger, wanted) != nullptr ? LineVerdict::kEvent : LineVerdict::kNext;
  });
}

}  // namespace

IQeyeV2MD::IQeyeV2MD(Camera* camera) : MotionDataMD(camera, nullptr, {MotionLineFormat::kWindowNumber, IdleLevel::kLastLine, kMotionDataPath}) {}

IQeyeV2MD::~IQeyeV2MD() { StopIfStarted(); }

IQeyeV1MD::IQeyeV1MD(Camera* camera) : camera_(camera) {}

IQeyeV1MD::~IQeyeV1MD() { StopIfStarted(); }

int IQeyeV1MD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, TriggerShape(), motion, level,
                        [](char* text, int length, unsigned int& found) {
                          if (FindTrigger(text, length, "motion") == 0) return false;
                          found = 100;
                          return true;
                        });
}

int IQeyeV1MD::EventDetecor() {
  RunFixedMotionDataLoop(*this, event_buffer_, camera_, kMotionPushPath,
                         [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                           return DoMD(fetch, motion, level);
                         });
  return 0;
}

IQeyeV2EID::IQeyeV2EID(Camera* camera, int inputs) : camera_(camera), inputs_(inputs) {}

IQeyeV2EID::~IQeyeV2EID() { StopIfStarted(); }

int IQeyeV2EID::DoEID(MultipartFetch* fetch, bool& active) {
  return ReadJudgedPart(fetch, TriggerShape(), active, [](char* text, int length) {
    return FindTrigger(text, length, "input") != 0;
  });
}

int IQeyeV2EID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  StreamLoopShape loop;
  loop.period = kOneSecond;
  RunInputStreamLoop(*this, event_buffer_, *camera_, kTriggerPushPath, camera_->GetPort(), loop,
                     [this](MultipartFetch* fetch, bool& active) { return DoEID(fetch, active); });
  return 0;
}
