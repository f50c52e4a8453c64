// Mobotix network cameras: MobotixMD watches the camera's alarm counter for video motion
// (type EVENT_DET_MOTION) or for the signal input (EVENT_DET_INPUT). Once per bound interval
// it asks for the alarm update of that kind and reports an event whenever the counter has
// moved since the previous reading, by any amount and in either direction.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_MOBOTIX_H_
#define EVWATCH_DETECTORS_MOBOTIX_H_

#include <cstdint>
#include <string>

#include "framework/detector.h"
#include "framework/host/hosttypes.h"

class Camera;

class MobotixMD : public DetectorBase {
 public:
  // Any type value is taken; one other than motion or input asks the empty path.
  MobotixMD(Camera* camera, EVENT_DET_TYPE type);
  ~MobotixMD() override;

  // One reading: state true when the counter moved, level 100 for the motion type and 1
  // for any other. 0 on success (a first line without a counter included), -1 on failure.
  int DoMD(bool& detected, unsigned int& level);
  // One request for path and the parse of the answer's first line. `changed` tells whether
  // the counter differs from the last one read; the counter read becomes the last one.
  // A line without "alarmcounter=" is a reading of no change and keeps the last counter.
  // 0 on success, -1 on failure (null camera, request, status, no first line).
  int SendReqAndGetResp(Camera* camera, std::string path, bool& changed);
  // Polls once per bound interval. The first pass of a run reports nothing when it
  // succeeds: it only loads the counter, which would otherwise look moved from 0.
  int EventDetecor() override;

 private:
  Camera* camera_;              // not owned
  EVENT_DET_TYPE type_;
  int32_t last_alarm_counter_;  // counter of the last successful parse; 0 until then
};

#endif  // EVWATCH_DETECTORS_MOBOTIX_H_
