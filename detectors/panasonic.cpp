#include "detectors/panasonic.h"

#include <cctype>
#include <climits>
#include <cstdio>
#include <cstring>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/motiondata.h"
#include "framework/readline.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

// These cameras can be slow to begin a stream.
const int kPanaTimeout = 20;

// The motion line's scan format for a channel. The channel is the host's text and goes in
// as a literal, so a '%' in it cannot become a conversion.
std::string MotionFormat(const std::string& channel) {
  if (channel == "1") return "motiondetect %c";
  std::string format = "motiondetect ch";
  for (char c : channel) format += c == '%' ? std::string("%%") : std::string(1, c);
  return format + "%c";
}

// The number that follows "terminal" at the start of line, with what follows it in *rest;
// -1 when there is none, it has a leading 0, or it is beyond int. This is the one input
// whose format "terminal<N> I %c" could match the line: every other N differs from the
// line's digits at some digit, or ends where the line has another digit.
long long TerminalNumber(const char* line, const char** rest) {
  static const char kPrefix[] = "terminal";
  const size_t prefix = sizeof(kPrefix) - 1;
  if (strncmp(line, kPrefix, prefix) != 0) return -1;
  const char* digits = line + prefix;
  if (*digits < '1' || *digits > '9') return -1;
  long long number = 0;
  const char* p = digits;
  for (; isdigit(static_cast<unsigned char>(*p)); ++p) {
    number = number * 10 + (*p - '0');
    if (number > INT_MAX) return -1;
  }
  *rest = p;
  return number;
}

}  // namespace

PanaMD::PanaMD(Camera* camera, CameraAPI* api) : camera_(camera), api_(api) {}

PanaMD::~PanaMD() { StopIfStarted(); }

int PanaMD::DoMD(MultipartFetch* fetch, bool& detected, unsigned int& level) {
  detected = false;
  level = 0;
  if (fetch == nullptr) return -1;
  if (api_ != nullptr) {
    std::string path;
    int port = 80;
    GetApiStream(*api_, path, port);
  }
  return ReadMotionPart(fetch, detected, level, [this](char* text, int length, unsigned int& found) {
    return IsMotionDetected(text, length, found) == 1;
  });
}

int PanaMD::IsMotionDetected(char* text, int length, unsigned int& level) {
  const std::string format = MotionFormat(camera_ != nullptr ? camera_->GetCH() : "1");
  char state = 'F';
  const int result = ScanLines(text, length, [&](const char* line) {
    if (sscanf(line, format.c_str(), &state) == EOF) return LineVerdict::kEnd;
    return state == 'T' ? LineVerdict::kEvent : LineVerdict::kNext;
  });
  if (result == 1) level = 100;
  return result;
}

int PanaMD::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  std::string path;
  int port = 80;
  if (!GetApiStream(*api_, path, port)) return 0;
  StreamLoopShape loop;
  loop.timeout = kPanaTimeout;
  RunMotionStreamLoop(*this, event_buffer_, *camera_, path, port, loop,
                      [this](MultipartFetch* fetch, bool& detected, unsigned int& level) {
                        return DoMD(fetch, detected, level);
                      });
  return 0;
}

PanaEID::PanaEID(Camera* camera, CameraAPI* api, int inputs)
    : camera_(camera), api_(api), inputs_(inputs) {}

PanaEID::~PanaEID() { StopIfStarted(); }

int PanaEID::DoEID(MultipartFetch* fetch, bool& active) {
  return ReadJudgedPart(fetch, StreamPart::Shape{}, active, [this](char* text, int length) {
    bool found = false;
    QueryCamera(text, length, found);
    return found;
  });
}

void PanaEID::QueryCamera(char* text, int length, bool& active) {
  // The state letter lives across lines and is changed only by a line that matches a
  // watched input's format "terminal<N> I %c".
  char state = 'H';
  const int found = ScanLines(text, length, [&](const char* line) {
    const char* rest = nullptr;
    const long long number = TerminalNumber(line, &rest);
    if (number >= 1 && number <= inputs_) sscanf(rest, " I %c", &state);
    return state == 'L' ? LineVerdict::kEvent : LineVerdict::kNext;
  });
  if (found == 1) active = true;
}

int PanaEID::EventDetecor() {
  if (camera_ == nullptr || api_ == nullptr) return 0;
  // Without a stream from the API the loop still runs, on an empty path and port 80.
  std::string path;
  int port = 80;
  GetApiStream(*api_, path, port);
  StreamLoopShape loop;
  loop.timeout = kPanaTimeout;
  RunInputStreamLoop(*this, event_buffer_, *camera_, path, port, loop,
                     [this](MultipartFetch* fetch, bool& active) { return DoEID(fetch, active); });
  return 0;
}
