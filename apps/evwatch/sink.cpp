#include "apps/evwatch/sink.h"

#include <time.h>

#include <cstdio>
#include <iomanip>
#include <nlohmann/json.hpp>
#include <sstream>

namespace evwatch {
namespace {

std::string FormatTime(std::chrono::system_clock::time_point time, bool utc) {
  using namespace std::chrono;
  const auto ms = duration_cast<milliseconds>(time.time_since_epoch()).count();
  time_t seconds = static_cast<time_t>(ms / 1000);
  int millis = static_cast<int>(ms % 1000);
  if (millis < 0) {
    millis += 1000;
    --seconds;
  }
  struct tm parts;
  if (utc) {
    gmtime_r(&seconds, &parts);
  } else {
    localtime_r(&seconds, &parts);
  }
  char text[64];
  size_t n = strftime(text, sizeof text, utc ? "%Y-%m-%dT%H:%M:%S" : "%Y-%m-%d %H:%M:%S", &parts);
  snprintf(text + n, sizeof text - n, utc ? ".%03dZ" : ".%03d", millis);
  return text;
}

}  // namespace

std::string IsoTime(std::chrono::system_clock::time_point time) { return FormatTime(time, true); }

std::string LocalTime(std::chrono::system_clock::time_point time) { return FormatTime(time, false); }

Sink::Sink(std::ostream& out, OutputFormat format, bool every)
    : out_(out), format_(format), every_(every) {}

int Sink::Add(std::string camera, std::string detector, std::string cls, DetectorKind kind) {
  std::lock_guard<std::mutex> lock(mutex_);
  entries_.push_back(Entry{std::move(camera), std::move(detector), std::move(cls), kind});
  return static_cast<int>(entries_.size()) - 1;
}

std::string Sink::Line(const Entry& e, const StatusReport& report, bool unreachable) const {
  if (format_ == OutputFormat::kJsonl) {
    nlohmann::ordered_json line = {{"ts", IsoTime(report.time)},
                                   {"camera", e.camera},
                                   {"detector", e.detector},
                                   {"class", e.cls},
                                   {"state", report.state},
                                   {"value", report.value}};
    return line.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
  }
  // Motion reads as motion / no motion with its level; an input as active / idle with
  // whether the reading was valid (0 also closes a detector's run), or with its level.
  const bool motion = e.kind == DetectorKind::kMotion;
  const bool level = motion || e.kind == DetectorKind::kInputLevel;
  const char* words = unreachable ? "unreachable"
                      : motion    ? (report.state ? "MOTION" : "no motion")
                                  : (report.state ? "ACTIVE" : "idle");
  std::ostringstream line;
  line << LocalTime(report.time) << "  " << std::left << std::setw(12) << e.camera << ' '
       << std::setw(16) << e.detector << ' ' << std::setw(10) << words << ' '
       << (level ? "level " : "valid ") << report.value;
  return line.str();
}

void Sink::Report(int handle, const StatusReport& report) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (handle < 0 || static_cast<size_t>(handle) >= entries_.size()) return;
  Entry& e = entries_[handle];
  // A failed reading is (false, 0), as is a quiet one; the text format tells them apart.
  const bool unreachable = format_ == OutputFormat::kText && failing_ && !report.state && report.value == 0 &&
                           failing_(e.camera);
  const bool changed =
      !e.reported || e.state != report.state || e.value != report.value || e.unreachable != unreachable;
  e.reported = true;
  e.state = report.state;
  e.value = report.value;
  e.unreachable = unreachable;
  if (!changed && !every_) return;
  out_ << Line(e, report, unreachable) << '\n' << std::flush;
  if (!out_) failed_ = true;
  ++e.lines;
}

std::map<std::string, size_t> Sink::LinesPerCamera() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::map<std::string, size_t> lines;
  for (const Entry& e : entries_) lines[e.camera] += e.lines;
  return lines;
}

}  // namespace evwatch
