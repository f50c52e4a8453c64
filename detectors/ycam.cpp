#include "detectors/ycam.h"

#include <string>

#include "framework/binaryrecord.h"
#include "framework/polledloop.h"

namespace {

const char kStatusPath[] = "stream.arm";
const int kAreas = 4;
const int kRecordSize = 8;

// The status record: bytes 0..3 are the areas' levels, bits 0..3 of byte 4 their flags.
struct ArmRecord {
  unsigned char levels[kAreas];
  bool flags[kAreas];
};

// 0 when the camera answered with a whole record, else -1.
int GetHttpRespToBuf(Camera* camera, const std::string& path, ArmRecord& record) {
  unsigned char data[kRecordSize];
  if (GetBinaryRecord(camera, path, data, kRecordSize) != 0) return -1;
  for (int area = 0; area < kAreas; ++area) {
    record.levels[area] = data[area];
    record.flags[area] = (data[kAreas] >> area) & 1;
  }
  return 0;
}

}  // namespace

YCAMMD::YCAMMD(Camera* camera) : camera_(camera) {}

YCAMMD::~YCAMMD() { StopIfStarted(); }

int YCAMMD::DoMD(bool& state, unsigned int& level) {
  state = false;
  level = 0;
  ArmRecord record;
  if (GetHttpRespToBuf(camera_, kStatusPath, record) != 0) return -1;
  for (int area = 0; area < kAreas; ++area) {
    if (record.levels[area] > level) level = record.levels[area];
    if (record.flags[area]) {
      state = true;
      break;
    }
  }
  return 0;
}

int YCAMMD::EventDetecor() {
  RunMotionPolledLoop(*this, event_buffer_, IntervalMicros(),
                      [this](bool& state, unsigned int& level) { return DoMD(state, level); });
  return 0;
}
