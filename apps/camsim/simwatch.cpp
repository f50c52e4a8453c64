#include "apps/camsim/simwatch.h"

namespace evsim {

std::vector<evwatch::WatchedCamera> SimWatch(const std::vector<SimCamera>& cameras,
                                             const SimWatchOptions& options) {
  std::vector<evwatch::WatchedCamera> list;
  for (const SimCamera& camera : cameras) {
    evwatch::WatchedCamera c;
    for (const DetectorEntry& entry : camera.emulation->detectors) {
      if (!options.keep || options.keep(entry.cls)) {
        c.detectors.push_back({entry.cls, entry.name, entry.fields});
      }
    }
    if (c.detectors.empty()) continue;
    c.name = camera.name;
    c.host = camera.host.empty() ? options.host : camera.host;
    c.port = camera.port;
    c.user = options.user;
    c.password = options.password;
    if (camera.emulation->api_with_tcp_port) {
      c.api = camera.emulation->api_with_tcp_port(camera.port, camera.tcp_port);
    } else if (camera.emulation->api) {
      c.api = camera.emulation->api(camera.port);
    }
    c.stream_type = camera.emulation->stream_type;
    c.video_type = camera.emulation->video_type;
    if (camera.emulation->frames) {
      // The frame buffer's shared-memory key follows the camera id: the port, unique among
      // the simulators running on this host, keeps two evwatch runs from sharing a key.
      c.id = camera.port;
      c.frames = camera.emulation->frames(camera.port);
    }
    list.push_back(std::move(c));
  }
  return list;
}

}  // namespace evsim
