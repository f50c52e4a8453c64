#include "sim/evwatchconfig.h"

namespace evsim {

nlohmann::ordered_json EvwatchConfig(const std::vector<SimCamera>& cameras,
                                     const EvwatchConfigOptions& options) {
  using nlohmann::ordered_json;
  ordered_json list = ordered_json::array();
  for (const SimCamera& camera : cameras) {
    ordered_json detectors = ordered_json::array();
    for (const DetectorEntry& entry : camera.emulation->detectors) {
      if (options.keep && !options.keep(entry.cls)) continue;
      ordered_json d = {{"class", entry.cls}, {"name", entry.name}};
      if (entry.fields.is_object()) {
        for (const auto& [key, value] : entry.fields.items()) d[key] = value;
      }
      detectors.push_back(std::move(d));
    }
    if (detectors.empty()) continue;
    ordered_json c = {{"name", camera.name}, {"host", options.host}, {"port", camera.port}};
    if (!options.user.empty()) {
      c["user"] = options.user;
      c["password"] = options.password;
    }
    if (camera.emulation->api) c["api"] = camera.emulation->api(camera.port);
    if (camera.emulation->frames) {
      // The frame buffer's shared-memory key follows the camera id: the port, unique among
      // the simulators running on this host, keeps two evwatch runs from sharing a key.
      c["id"] = camera.port;
      c["frames"] = camera.emulation->frames(camera.port);
    }
    c["detectors"] = std::move(detectors);
    list.push_back(std::move(c));
  }
  return ordered_json{{"interval", options.interval}, {"cameras", std::move(list)}};
}

}  // namespace evsim
