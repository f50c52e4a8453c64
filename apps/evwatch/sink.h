// Where the readings of every detector go: one line per report on an output stream, as
// JSON lines or as text for people. Without `every`, a report is written only when its
// (state, value) differs from that detector's previous report (the first is always written).
// Each line is flushed at once.
//
// Threads: Add() before the detectors start; Report() from any number of detector threads
// at once. Lines never interleave, and one detector's lines keep the order of its reports.

#ifndef EVWATCH_APPS_EVWATCH_SINK_H_
#define EVWATCH_APPS_EVWATCH_SINK_H_

#include <atomic>
#include <functional>
#include <map>
#include <mutex>
#include <ostream>
#include <string>
#include <vector>

#include "apps/evwatch/registry.h"
#include "framework/host/eventbuf.h"

namespace evwatch {

enum class OutputFormat { kJsonl, kText };

class Sink {
 public:
  // REQUIRES: out outlives the sink.
  Sink(std::ostream& out, OutputFormat format, bool every);
  Sink(const Sink&) = delete;
  Sink& operator=(const Sink&) = delete;

  // Registers a detector and returns its handle for Report(). `kind` chooses the words of
  // the text format (motion or input).
  int Add(std::string camera, std::string detector, std::string cls, DetectorKind kind);
  void Report(int handle, const StatusReport& report);

  // For the text format: whether a camera's requests are failing now. A detector's (false, 0)
  // then reads "unreachable" instead of "no motion" or "idle"; the JSON lines do not change.
  // REQUIRES: set before the detectors start.
  void SetFailing(std::function<bool(const std::string& camera)> failing) { failing_ = std::move(failing); }

  // Whether a write has failed (the output was closed).
  bool Failed() const { return failed_.load(); }
  // How many lines each camera's detectors have printed, by camera name.
  std::map<std::string, size_t> LinesPerCamera() const;

 private:
  struct Entry {
    std::string camera;
    std::string detector;
    std::string cls;
    DetectorKind kind;
    bool reported = false;  // whether state/value hold a previous report
    bool unreachable = false;  // the text format said so for the previous report
    size_t lines = 0;       // printed so far
    bool state = false;
    int value = 0;
  };

  // One line without its newline.
  std::string Line(const Entry& e, const StatusReport& report, bool unreachable) const;

  std::ostream& out_;
  const OutputFormat format_;
  const bool every_;
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;  // by handle; guarded by mutex_
  std::atomic<bool> failed_{false};
  std::function<bool(const std::string& camera)> failing_;
};

// "2026-11-20T12:00:00.123Z" (UTC).
std::string IsoTime(std::chrono::system_clock::time_point time);
// "2026-11-20 13:00:00.123" (local time).
std::string LocalTime(std::chrono::system_clock::time_point time);

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_SINK_H_
