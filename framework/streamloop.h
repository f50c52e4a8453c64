// The loop of the event-stream detectors, written once: one MultipartFetch for the whole
// loop on the camera's host with its credentials, one pass per part (the camera's parts set
// the pace unless the loop is paced; the fetcher blocks until a part comes or its time-out
// passes, and reconnects by itself after a failed read), a report when a pass has one, and
// a final (false, 0) so that the host never keeps a stale state after Stop.
//
// Threads: runs on the detector's worker thread; the fetcher never leaves it.

#ifndef EVWATCH_FRAMEWORK_STREAMLOOP_H_
#define EVWATCH_FRAMEWORK_STREAMLOOP_H_

#include <memory>
#include <optional>
#include <string>

#include "framework/detector.h"
#include "framework/host/delaytimer.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "framework/polledloop.h"

class Camera;
class CameraAPI;

// Time-out in seconds of the stream readers the detectors open, unless a loop says otherwise.
constexpr int kStreamTimeout = 10;

// How a stream loop runs where detectors differ.
struct StreamLoopShape {
  int timeout = kStreamTimeout;  // the reader's, in seconds
  int period = 0;  // microseconds from the start of one pass to the next; 0: no pacing
  DelayTimer::Clock* clock = nullptr;  // the pacing clock; null: DelayTimer's system clock
};

// A reader of the multipart stream at path on the camera's host and `port`, with the
// camera's credentials. Null only when it could not be made (out of memory).
std::unique_ptr<MultipartFetch> OpenPartStream(const Camera& camera, const std::string& path,
                                               int port, int timeout = kStreamTimeout);

// The stream that the camera's API names: its path and port (the port preset to 80 before
// the API is asked). False when the API has none.
bool GetApiStream(CameraAPI& api, std::string& path, int& port);

// Opens the stream and, while detector.IsStarted() yields 1, calls pass(fetch) and reports
// what it returns (nothing for nullopt), waiting out shape.period after each pass when it
// is set; then reports (false, 0) and closes the stream.
// pass: std::optional<PassReport>(MultipartFetch*).
template <typename Pass>
void RunStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                   const std::string& path, int port, const StreamLoopShape& shape, Pass&& pass) {
  std::unique_ptr<MultipartFetch> fetch = OpenPartStream(camera, path, port, shape.timeout);
  std::optional<DelayTimer> timer;
  if (shape.period > 0) {
    timer.emplace(shape.period,
                  shape.clock != nullptr ? shape.clock : DelayTimer::SystemClock());
    timer->BeginTiming();
  }
  while (fetch != nullptr && detector.IsStarted() == 1) {
    std::optional<PassReport> report = pass(fetch.get());
    if (report) buffer->SetStatus(report->state, report->value);
    if (timer) timer->Delay();
  }
  buffer->SetStatus(false, 0);
}

template <typename Pass>
void RunStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                   const std::string& path, int port, Pass&& pass) {
  RunStreamLoop(detector, buffer, camera, path, port, StreamLoopShape{}, pass);
}

// The motion loop: a reading per pass through doMD(fetch, motion, level), reported as
// (motion, level), or (false, 0) when no part could be read and judged.
template <typename DoMD>
void RunMotionStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                         const std::string& path, int port, const StreamLoopShape& shape,
                         DoMD&& doMD) {
  RunStreamLoop(detector, buffer, camera, path, port, shape,
                [&doMD](MultipartFetch* fetch) -> std::optional<PassReport> {
                  bool motion = false;
                  unsigned int level = 0;
                  int result = doMD(fetch, motion, level);
                  return MotionReport(result, motion, level);
                });
}

template <typename DoMD>
void RunMotionStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                         const std::string& path, int port, DoMD&& doMD) {
  RunMotionStreamLoop(detector, buffer, camera, path, port, StreamLoopShape{}, doMD);
}

// The input loop: a reading per pass through doEID(fetch, active), reported as (active, 1),
// or (false, 0) when no part could be read and judged (the value is a validity flag).
template <typename DoEID>
void RunInputStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                        const std::string& path, int port, const StreamLoopShape& shape,
                        DoEID&& doEID) {
  RunStreamLoop(detector, buffer, camera, path, port, shape,
                [&doEID](MultipartFetch* fetch) -> std::optional<PassReport> {
                  bool active = false;
                  int result = doEID(fetch, active);
                  return InputReport(result, active);
                });
}

#endif  // EVWATCH_FRAMEWORK_STREAMLOOP_H_
