// The evwatch configuration: cameras, their records and camera-API descriptors, and the
// detectors to run on each, read from a YAML (or JSON) file and checked strictly: unknown
// keys, wrong types, missing required fields, duplicate names, out-of-range numbers and
// unknown detector classes are errors. An error message names the file, the line, the
// field path (cameras[2].detectors[0].class) and the problem, on one line.
//
// Threads: pure functions; a Config is plain data.

#ifndef EVWATCH_APPS_EVWATCH_CONFIG_H_
#define EVWATCH_APPS_EVWATCH_CONFIG_H_

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"

namespace evwatch {

struct DetectorConfig {
  std::string path;              // field path of the entry, "cameras[0].detectors[1]"
  std::string cls;               // a registered class name
  std::string name;              // unique within its camera; default: the class name
  std::optional<int> interval;   // ms; default: the file's interval
  int inputs = 1;                // the int constructor argument, for classes that take it
  int function_group = 0;        // VIVO_FUNC_GR / PANA_FUNC_GR, for classes that take it; any int
  int type = 0;                  // EVENT_DET_TYPE, for classes that take it; any int
  bool stream_buffer = false;    // hand the camera's frame buffer to the constructor
};

struct CameraConfig {
  std::string path;                       // "cameras[0]"
  std::string name;                       // unique among the cameras
  CameraRecord record;                    // address, credentials, channel, motion settings
  CameraAPIRecord api;                    // the camera's api: block
  std::optional<StreamLocation> frames;   // MJPEG source of the camera's frame buffer
  std::vector<DetectorConfig> detectors;  // at least one
};

struct Config {
  std::string file;                  // as named on the command line
  int interval = 500;                // ms, the default Init interval
  std::vector<CameraConfig> cameras;  // at least one
  // Values that pass the checks but make a detector useless, one line each, in the form of
  // an error: "FILE:LINE: FIELD: warning: PROBLEM". Shown once, before the run.
  std::vector<std::string> warnings;

  size_t DetectorCount() const;
};

// Reads and checks `file`. On an error returns nullopt and sets *error to one line without
// a trailing newline: "FILE:LINE: FIELD: PROBLEM" (or "FILE: PROBLEM").
std::optional<Config> LoadConfig(const std::string& file, std::string* error);
// The same for text already in memory; `file` names it in messages.
std::optional<Config> ParseConfig(const std::string& text, const std::string& file,
                                  std::string* error);

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_CONFIG_H_
