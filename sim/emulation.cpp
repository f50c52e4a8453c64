#include "sim/emulation.h"

#include <algorithm>
#include <utility>

namespace evsim {

// One per maker, each in its own file.
Emulation ActiEmulation();
Emulation AirLiveEmulation();
Emulation ArecontEmulation();
Emulation AVIPCEmulation();
Emulation AxisEmulation();
Emulation BrickcomEmulation();
Emulation CanonEmulation();
Emulation ComproEmulation();
Emulation DLinkEmulation();
Emulation EdimaxEmulation();
Emulation EtrovisionEmulation();
Emulation HikVisionEmulation();
Emulation IpuxEmulation();
Emulation IqeyeEmulation();
Emulation JvcEmulation();
Emulation LevelOneEmulation();
Emulation MessoaEmulation();
Emulation MessoaProEmulation();
Emulation MobotixEmulation();
Emulation OnvifEmulation();
Emulation OnvifAlarmEmulation();
Emulation PanasonicEmulation();
Emulation PixordEmulation();
Emulation PsiaEmulation();
Emulation SanyoEmulation();
Emulation SceneEmulation();
Emulation SonyEmulation();
Emulation StorageEmulation();
Emulation VivotekEmulation();
Emulation YcamEmulation();
Emulation ZavioEmulation();

const std::vector<Emulation>& Emulations() {
  static const std::vector<Emulation> table = {
      ActiEmulation(),
      AirLiveEmulation(),
      ArecontEmulation(),
      AVIPCEmulation(),
      AxisEmulation(),
      BrickcomEmulation(),
      CanonEmulation(),
      ComproEmulation(),
      DLinkEmulation(),
      EdimaxEmulation(),
      EtrovisionEmulation(),
      HikVisionEmulation(),
      IpuxEmulation(),
      IqeyeEmulation(),
      JvcEmulation(),
      LevelOneEmulation(),
      MessoaEmulation(),
      MessoaProEmulation(),
      MobotixEmulation(),
      OnvifEmulation(),
      OnvifAlarmEmulation(),
      PanasonicEmulation(),
      PixordEmulation(),
      PsiaEmulation(),
      SanyoEmulation(),
      SceneEmulation(),
      SonyEmulation(),
      StorageEmulation(),
      VivotekEmulation(),
      YcamEmulation(),
      ZavioEmulation(),
  };
  return table;
}

Emulation MakeEmulation(std::string key, std::string maker,
                        std::function<void(HttpConnection&, CameraState&)> handle,
                        std::vector<DetectorEntry> detectors) {
  Emulation e;
  e.key = std::move(key);
  e.maker = std::move(maker);
  e.handle = std::move(handle);
  for (const DetectorEntry& d : detectors) {
    if (std::find(e.classes.begin(), e.classes.end(), d.cls) == e.classes.end()) e.classes.push_back(d.cls);
  }
  e.detectors = std::move(detectors);
  return e;
}

std::function<nlohmann::json(int port)> StreamApi(std::string path, std::string name) {
  return [path, name](int port) {
    nlohmann::json api = {{"stream", {{"path", path}, {"port", port}}}};
    if (!name.empty()) api["name"] = name;
    return api;
  };
}

std::function<nlohmann::json(int port)> FramesAt(std::string path) {
  return [path](int port) { return nlohmann::json{{"path", path}, {"port", port}}; };
}

void AnswerNotFound(HttpConnection& connection) {
  connection.Write(MakeResponse(404, "text/plain", "not found\r\n"));
}

bool ServesGetOf(HttpConnection& connection, std::string_view path) {
  const HttpRequest& request = connection.Request();
  if (request.method == "GET" && request.Path() == path) return true;
  AnswerNotFound(connection);
  return false;
}

const Emulation* FindEmulation(std::string_view key) {
  for (const Emulation& e : Emulations()) {
    if (e.key == key) return &e;
  }
  return nullptr;
}

const Emulation* EmulationForClass(std::string_view cls) {
  for (const Emulation& e : Emulations()) {
    if (std::find(e.classes.begin(), e.classes.end(), cls) != e.classes.end()) return &e;
  }
  return nullptr;
}

}  // namespace evsim
