// Multipart pushes for stream-detector tests: a FakeCamera handler that pushes scripted parts
// on each connection it gets, and a stream reader opened on a fake camera as the detectors
// open theirs.
//
//   cam.Handle("/md.cgi", evtest::PushHandler({evtest::Push{{"group=0;level=60;threshold=50;"}}}));
//   auto fetch = evtest::FetchFrom(cam, "/md.cgi");
//   ... detector.DoMD(fetch.get(), motion, level) ...
//
// Threads: the handler runs on the fake camera's connection threads.

#ifndef EVWATCH_TESTS_SUPPORT_STREAMPUSH_H_
#define EVWATCH_TESTS_SUPPORT_STREAMPUSH_H_

#include <chrono>
#include <gtest/gtest.h>
#include <iosfwd>
#include <memory>
#include <string>
#include <vector>

#include "framework/host/fetcher.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace evtest {

// What one connection gets.
struct Push {
  enum End {
    kHold,        // keep the connection open, silent, until the client goes
    kClose,       // close the connection
    kRepeatLast,  // write the last part again every `gap` (at least 2 ms) until the client goes
  };

  std::vector<std::string> parts;  // bodies, in order
  End end = kHold;
  std::chrono::milliseconds gap{0};  // wait before every part after the first
  std::string content_type = "text/plain";
  int status = 200;  // other than 200: that answer and no stream
  // The parts are whole part texts, from the boundary line on (RawPart builds them),
  // written as they stand, for cameras that send text around their bodies.
  bool raw = false;
};

// A whole part as raw pushes write it: "--myboundary", the Content-Type, Content-Length and
// `headers` lines (each without its line end), a blank line, the body, CR LF, then
// `trailer` as it stands (text before the next boundary).
std::string RawPart(const std::string& body, const std::vector<std::string>& headers = {},
                    const std::string& trailer = "",
                    const std::string& content_type = "text/plain");

// A FakeCamera handler: the n-th connection (from 0) gets pushes[min(n, size - 1)].
// REQUIRES: pushes is not empty.
FakeCamera::Handler PushHandler(std::vector<Push> pushes);

// A stream reader of `target` on the camera (time-out 10 s), with the given credentials.
std::unique_ptr<MultipartFetch> FetchFrom(const FakeCamera& camera, const std::string& target,
                                          const std::string& user = "",
                                          const std::string& password = "");

// One DoMD reading: its result, motion and level.
struct MotionReading {
  int result;
  bool motion;
  unsigned int level;
  bool operator==(const MotionReading& o) const {
    return result == o.result && motion == o.motion && level == o.level;
  }
};
void PrintTo(const MotionReading& reading, std::ostream* os);

// Pushes `bodies` as parts on `target` (then holds the connection) and reads one reading per
// body with detector.DoMD(fetch, motion, level), motion and level preset to true and 77 so
// that the reading shows what DoMD set.
template <class Detector>
std::vector<MotionReading> ReadMotionParts(FakeCamera& camera, const std::string& target,
                                           Detector& detector,
                                           const std::vector<std::string>& bodies) {
  camera.Handle(target, PushHandler({Push{bodies}}));
  std::unique_ptr<MultipartFetch> fetch = FetchFrom(camera, target);
  std::vector<MotionReading> readings;
  for (size_t i = 0; i < bodies.size(); ++i) {
    MotionReading r{0, true, 77};
    r.result = detector.DoMD(fetch.get(), r.motion, r.level);
    readings.push_back(r);
  }
  return readings;
}

// One DoEID reading: its result and state.
struct InputReading {
  int result;
  bool active;
  bool operator==(const InputReading& o) const { return result == o.result && active == o.active; }
};
void PrintTo(const InputReading& reading, std::ostream* os);

// As ReadMotionParts, for detectors whose reading is DoEID(fetch, active) (preset to true).
// With raw, the bodies are whole part texts (see RawPart).
template <class Detector>
std::vector<InputReading> ReadInputParts(FakeCamera& camera, const std::string& target,
                                         Detector& detector,
                                         const std::vector<std::string>& bodies,
                                         bool raw = false) {
  Push push{bodies};
  push.raw = raw;
  camera.Handle(target, PushHandler({push}));
  std::unique_ptr<MultipartFetch> fetch = FetchFrom(camera, target);
  std::vector<InputReading> readings;
  for (size_t i = 0; i < bodies.size(); ++i) {
    InputReading r{0, true};
    r.result = detector.DoEID(fetch.get(), r.active);
    readings.push_back(r);
  }
  return readings;
}

// As ReadMotionParts, with the bodies being whole part texts (see RawPart).
template <class Detector>
std::vector<MotionReading> ReadRawMotionParts(FakeCamera& camera, const std::string& target,
                                              Detector& detector,
                                              const std::vector<std::string>& parts) {
  Push push{parts};
  push.raw = true;
  camera.Handle(target, PushHandler({push}));
  std::unique_ptr<MultipartFetch> fetch = FetchFrom(camera, target);
  std::vector<MotionReading> readings;
  for (size_t i = 0; i < parts.size(); ++i) {
    MotionReading r{0, true, 77};
    r.result = detector.DoMD(fetch.get(), r.motion, r.level);
    readings.push_back(r);
  }
  return readings;
}

// Pushes for a camera that stops pushing and comes back: the first connection gets `before`
// and is closed, the second is refused (503), every later one gets `after` again and again
// every 5 ms. With raw, the parts are whole part texts (see RawPart).
FakeCamera::Handler OutageHandler(std::vector<std::string> before, std::string after,
                                  bool raw = false);

// Whether a run's reports show such a camera followed: `first` first, then at least one
// (false, 0) while nothing could be read, then `back`.
::testing::AssertionResult FollowedAcrossOutage(const std::vector<Report>& reports, Report first,
                                                Report back);

}  // namespace evtest

#endif  // EVWATCH_TESTS_SUPPORT_STREAMPUSH_H_
