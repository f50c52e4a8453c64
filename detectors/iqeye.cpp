#include "detectors/iqeye.h"

#include "framework/motiondata.h"

namespace {

const char kMotionDataPath[] = "now.motiondata";

// 1 when a window of the part is above its threshold, with its level; else 0 with the
// last line's level.
int IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, MotionLineFormat::kWindowNumber,
                         IdleLevel::kLastLine);
}

}  // namespace

IQeyeV2MD::IQeyeV2MD(Camera* camera) : camera_(camera) {}

IQeyeV2MD::~IQeyeV2MD() { StopIfStarted(); }

int IQeyeV2MD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) != 0;
  });
}

int IQeyeV2MD::EventDetecor() {
  RunFixedMotionDataLoop(*this, event_buffer_, camera_, kMotionDataPath,
                         [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
                           return DoMD(fetch, motion, level);
                         });
  return 0;
}
