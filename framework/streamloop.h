// The loop of the event-stream detectors, written once: one MultipartFetch for the whole
// loop on the camera's host with its credentials, one pass per part with no delay between
// passes (the camera's parts set the pace; the fetcher blocks until a part comes or its
// time-out passes, and reconnects by itself after a failed read), a report when a pass has
// one, and a final (false, 0) so that the host never keeps a stale state after Stop.
//
// Threads: runs on the detector's worker thread; the fetcher never leaves it.

#ifndef EVWATCH_FRAMEWORK_STREAMLOOP_H_
#define EVWATCH_FRAMEWORK_STREAMLOOP_H_

#include <memory>
#include <optional>
#include <string>

#include "framework/detector.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "framework/polledloop.h"

class Camera;

// Time-out in seconds of every stream reader the detectors open.
constexpr int kStreamTimeout = 10;

// A reader of the multipart stream at path on the camera's host and `port`, with the
// camera's credentials. Null only when it could not be made (out of memory).
std::unique_ptr<MultipartFetch> OpenPartStream(const Camera& camera, const std::string& path,
                                               int port);

// Opens the stream and, while detector.IsStarted() yields 1, calls pass(fetch) and reports
// what it returns (nothing for nullopt); then reports (false, 0) and closes the stream.
// pass: std::optional<PassReport>(MultipartFetch*).
template <typename Pass>
void RunStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                   const std::string& path, int port, Pass&& pass) {
  std::unique_ptr<MultipartFetch> fetch = OpenPartStream(camera, path, port);
  while (fetch != nullptr && detector.IsStarted() == 1) {
    std::optional<PassReport> report = pass(fetch.get());
    if (report) buffer->SetStatus(report->state, report->value);
  }
  buffer->SetStatus(false, 0);
}

// The motion-data loop: a reading per part through doMD(fetch, motion, level), reported as
// (motion, level), or (false, 0) when no part could be read and judged.
template <typename DoMD>
void RunMotionStreamLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera,
                         const std::string& path, int port, DoMD&& doMD) {
  RunStreamLoop(detector, buffer, camera, path, port,
                [&doMD](MultipartFetch* fetch) -> std::optional<PassReport> {
                  bool motion = false;
                  unsigned int level = 0;
                  int result = doMD(fetch, motion, level);
                  return MotionReport(result, motion, level);
                });
}

#endif  // EVWATCH_FRAMEWORK_STREAMLOOP_H_
