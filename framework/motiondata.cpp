#include "framework/motiondata.h"

#include <cstdio>

#include "framework/readline.h"

namespace {

// sscanf's result for one line: EOF when the line ends before the first field.
int ScanLine(const char* line, MotionLineFormat format, int* level, int* threshold) {
  switch (format) {
    case MotionLineFormat::kGroupChar: {
      char group = 0;
      return sscanf(line, "group=%c;level=%d;threshold=%d;", &group, level, threshold);
    }
    case MotionLineFormat::kGroupNumber: {
      int group = 0;
      return sscanf(line, "group=%d;level=%d;threshold=%d;", &group, level, threshold);
    }
    case MotionLineFormat::kWindowNumber: {
      int window = 0;
      return sscanf(line, "window=%d;level=%d;threshold=%d", &window, level, threshold);
    }
  }
  return EOF;
}

}  // namespace

int ScanMotionLines(const char* body, int length, unsigned int& level, MotionLineFormat format,
                    IdleLevel idle) {
  if (length < 0) {
    if (idle == IdleLevel::kLargest) level = 0;
    return 0;
  }
  unsigned int largest = 0;
  const int motion = ScanLines(body, length, [&](const char* line) {
    int found_level = 0;
    int threshold = 0;
    const int fields = ScanLine(line, format, &found_level, &threshold);
    level = static_cast<unsigned int>(found_level);
    if (fields == EOF) return LineVerdict::kEnd;
    if (level > static_cast<unsigned int>(threshold)) return LineVerdict::kEvent;
    if (level > largest) largest = level;
    return LineVerdict::kNext;
  });
  if (motion == 1) return 1;
  if (idle == IdleLevel::kLargest) level = largest;
  return 0;
}

MotionDataMD::MotionDataMD(Camera* camera, CameraAPI* api, Shape shape)
    : camera_(camera), api_(api), shape_(shape) {}

int MotionDataMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  return ReadMotionPart(fetch, motion, level, [this](char* body, int length, unsigned int& found) {
    return IsMotionDetected(body, length, found) == 1;
  });
}

int MotionDataMD::IsMotionDetected(char* body, int length, unsigned int& level) {
  return ScanMotionLines(body, length, level, shape_.format, shape_.idle);
}

int MotionDataMD::EventDetecor() {
  auto doMD = [this](MultipartFetch* fetch, bool& motion, unsigned int& level) {
    return DoMD(fetch, motion, level);
  };
  if (shape_.fixed_path != nullptr) {
    RunFixedMotionDataLoop(*this, event_buffer_, camera_, shape_.fixed_path, doMD);
  } else {
    RunApiMotionDataLoop(*this, event_buffer_, camera_, api_, doMD);
  }
  return 0;
}
