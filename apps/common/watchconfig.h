// The configuration file's schema, on the writing side: the names of the fields that say
// which cameras to watch and with which detectors, and the writer of a configuration from
// such a list. The daemon's parser (apps/evwatch/config.cpp) reads the same names from
// here, so a field is named in one place.
//
// Threads: pure functions; the types are plain data.

#ifndef EVWATCH_APPS_COMMON_WATCHCONFIG_H_
#define EVWATCH_APPS_COMMON_WATCHCONFIG_H_

#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

namespace evwatch {

// Field names of the configuration file.
namespace field {
inline constexpr char kInterval[] = "interval";
inline constexpr char kCameras[] = "cameras";
inline constexpr char kName[] = "name";
inline constexpr char kHost[] = "host";
inline constexpr char kPort[] = "port";
inline constexpr char kUser[] = "user";
inline constexpr char kPassword[] = "password";
inline constexpr char kId[] = "id";
inline constexpr char kStreamType[] = "stream_type";
inline constexpr char kVideoType[] = "video_type";
inline constexpr char kApi[] = "api";
inline constexpr char kFrames[] = "frames";
inline constexpr char kDetectors[] = "detectors";
inline constexpr char kClass[] = "class";
}  // namespace field

// One detector entry: its class, its name within the camera, and the class's own fields
// (inputs, type, ...) as an object, or null.
struct WatchedDetector {
  std::string cls;
  std::string name;
  nlohmann::ordered_json fields;
};

// One camera entry. api and frames are the camera's `api:` and `frames:` blocks, or null.
struct WatchedCamera {
  std::string name;
  std::string host;
  int port = 0;
  std::string user;      // empty: the camera asks for no credentials
  std::string password;
  std::optional<int> id;
  std::optional<int> stream_type;  // absent: the camera's default (0)
  std::optional<int> video_type;
  nlohmann::ordered_json api;
  nlohmann::ordered_json frames;
  std::vector<WatchedDetector> detectors;
};

// The configuration that watches `cameras` with `interval` (ms) as the default interval.
// A camera without detector entries is left out, since the file requires at least one.
nlohmann::ordered_json WatchConfig(const std::vector<WatchedCamera>& cameras, int interval);

}  // namespace evwatch

#endif  // EVWATCH_APPS_COMMON_WATCHCONFIG_H_
