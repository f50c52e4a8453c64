#include "apps/evwatch/demo.h"

#include <string>

#include "apps/evwatch/config.h"
#include "apps/evwatch/endwait.h"
#include "apps/evwatch/registry.h"
#include "apps/evwatch/runner.h"
#include "apps/evwatch/sink.h"
#include "sim/evwatchconfig.h"
#include "sim/simulator.h"

namespace evwatch {

int RunDemo(std::optional<double> seconds, std::ostream& out, std::ostream& err) {
  evsim::Simulator simulator;
  evsim::SimOptions options;
  options.scenario = true;
  std::string error;
  if (!simulator.Start(options, &error)) {
    err << "evwatch: demo: simulator: " << error << std::endl;
    return 1;
  }

  evsim::EvwatchConfigOptions generate;
  generate.keep = [](const std::string& cls) { return FindDetectorClass(cls) != nullptr; };
  const std::string text = evsim::EvwatchConfig(simulator.Cameras(), generate).dump(2);
  std::optional<Config> config = ParseConfig(text, "(demo configuration)", &error);
  if (!config) {
    err << "evwatch: demo: " << error << std::endl;
    return 1;
  }

  out << "evwatch demo: " << config->cameras.size() << " simulated camera(s) on 127.0.0.1, "
      << config->DetectorCount() << " detectors; simulator control API on port "
      << simulator.ControlPort() << ".\n";
  for (const DetectorClass& c : DetectorClasses()) {
    if (evsim::EmulationForClass(c.name) == nullptr) {
      out << "  (" << c.name << " has no emulation yet and is not in the demo)\n";
    }
  }
  out << "Motion and inputs change every few seconds; ";
  if (seconds) {
    out << "the demo ends after " << *seconds << " s.\n" << std::flush;
  } else {
    out << "Ctrl-C ends the demo.\n" << std::flush;
  }

  Sink sink(out, OutputFormat::kText, false);
  Runner runner(std::move(*config), sink, err);
  if (!runner.Start(&error)) {
    err << "evwatch: demo: " << error << std::endl;
    return 1;
  }
  WaitForEnd(seconds, [&sink] { return sink.Failed(); });
  runner.Stop();
  simulator.Stop();
  return 0;
}

}  // namespace evwatch
