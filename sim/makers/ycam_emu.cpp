// Y-cam network cameras. /stream.arm answers an 8-byte binary record: the motion levels of
// the four detection areas (bytes 0..3), their motion flags (bits 0..3 of byte 4), and three
// reserved bytes. The camera flags an area once its level reaches its own trigger level, so
// a weak motion is measured but not flagged.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kArmPath[] = "/stream.arm";
constexpr int kAreas = 4;
constexpr int kTriggerLevel = 20;

// The scene's motion is strongest in area 0 and fades towards area 3.
std::string ArmRecord(const CameraStatus& status) {
  std::string record(8, '\0');
  for (int area = 0; area < kAreas; ++area) {
    const int level = status.motion * (kAreas - area) / kAreas;
    record[area] = static_cast<char>(level);
    if (level >= kTriggerLevel) record[kAreas] = static_cast<char>(record[kAreas] | (1 << area));
  }
  return record;
}

void HandleYcam(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kArmPath)) return;
  connection.Write(MakeResponse(200, "application/octet-stream", ArmRecord(state.Get())));
}

}  // namespace

Emulation YcamEmulation() {
  return MakeEmulation("ycam", "Y-cam", HandleYcam,
                       {
                           {"YCAMMD", "motion", nullptr},
                       });
}

}  // namespace evsim
