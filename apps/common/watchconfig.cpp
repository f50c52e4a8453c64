#include "apps/common/watchconfig.h"

namespace evwatch {

namespace {

nlohmann::ordered_json DetectorEntry(const WatchedDetector& d) {
  nlohmann::ordered_json entry = {{field::kClass, d.cls}, {field::kName, d.name}};
  if (d.fields.is_object()) {
    for (const auto& [key, value] : d.fields.items()) entry[key] = value;
  }
  return entry;
}

nlohmann::ordered_json CameraEntry(const WatchedCamera& c) {
  nlohmann::ordered_json entry = {{field::kName, c.name}, {field::kHost, c.host}, {field::kPort, c.port}};
  if (!c.user.empty()) {
    entry[field::kUser] = c.user;
    entry[field::kPassword] = c.password;
  }
  if (!c.api.is_null()) entry[field::kApi] = c.api;
  if (c.id) entry[field::kId] = *c.id;
  if (c.stream_type) entry[field::kStreamType] = *c.stream_type;
  if (c.video_type) entry[field::kVideoType] = *c.video_type;
  if (!c.frames.is_null()) entry[field::kFrames] = c.frames;
  nlohmann::ordered_json detectors = nlohmann::ordered_json::array();
  for (const WatchedDetector& d : c.detectors) detectors.push_back(DetectorEntry(d));
  entry[field::kDetectors] = std::move(detectors);
  return entry;
}

}  // namespace

nlohmann::ordered_json WatchConfig(const std::vector<WatchedCamera>& cameras, int interval) {
  nlohmann::ordered_json list = nlohmann::ordered_json::array();
  for (const WatchedCamera& c : cameras) {
    if (!c.detectors.empty()) list.push_back(CameraEntry(c));
  }
  return {{field::kInterval, interval}, {field::kCameras, std::move(list)}};
}

}  // namespace evwatch
