#include "sim/emulation.h"

#include <algorithm>

namespace evsim {

// One per maker, each in its own file.
Emulation ActiEmulation();
Emulation AirLiveEmulation();
Emulation AVIPCEmulation();
Emulation AxisEmulation();
Emulation CanonEmulation();
Emulation ComproEmulation();
Emulation DLinkEmulation();
Emulation HikVisionEmulation();
Emulation IpuxEmulation();
Emulation IqeyeEmulation();
Emulation JvcEmulation();
Emulation PanasonicEmulation();
Emulation PsiaEmulation();
Emulation SanyoEmulation();
Emulation SceneEmulation();
Emulation VivotekEmulation();
Emulation YcamEmulation();
Emulation ZavioEmulation();

const std::vector<Emulation>& Emulations() {
  static const std::vector<Emulation> table = {
      ActiEmulation(),
      AirLiveEmulation(),
      AVIPCEmulation(),
      AxisEmulation(),
      CanonEmulation(),
      ComproEmulation(),
      DLinkEmulation(),
      HikVisionEmulation(),
      IpuxEmulation(),
      IqeyeEmulation(),
      JvcEmulation(),
      PanasonicEmulation(),
      PsiaEmulation(),
      SanyoEmulation(),
      SceneEmulation(),
      VivotekEmulation(),
      YcamEmulation(),
      ZavioEmulation(),
  };
  return table;
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
