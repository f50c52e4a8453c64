// camsim: simulated network cameras on loopback, for evwatch, its tests and benchmarks.
//
//   camsim [-e KEY]... [-n COUNT] [--scenario demo|none] [--control-port P]
//          [--fixed-port-host ADDRESS|auto]
//          [--auth none|basic|digest --user U --password P] [--duration SECONDS]
//          [--format json|text] [--evwatch-config FILE] [--interval MS]
//   camsim --list
//
// On start it prints where its cameras and its control API listen (one JSON line, or
// lines of text), then serves until SIGINT/SIGTERM or the duration. With --evwatch-config
// it first writes an evwatch configuration that watches every camera it runs.
//
// Exit status: 0 after a normal end, 2 for a usage error, 1 when it cannot start.

#include <CLI/CLI.hpp>
#include <fstream>
#include <iostream>
#include <optional>
#include <string>
#include <vector>

#include "apps/common/endwait.h"
#include "apps/camsim/simwatch.h"
#include "sim/simulator.h"

namespace {

void List() {
  for (const evsim::Emulation& e : evsim::Emulations()) {
    std::cout << e.key << "\t" << e.maker << "\t";
    for (size_t i = 0; i < e.classes.size(); ++i) std::cout << (i ? "," : "") << e.classes[i];
    std::cout << "\n";
  }
  std::cout << std::flush;
}

void PrintText(const evsim::Simulator& simulator, const std::string& host) {
  for (const evsim::SimCamera& c : simulator.Cameras()) {
    std::cout << c.name << "\t" << c.emulation->maker << "\t" << (c.host.empty() ? host : c.host)
              << ":" << c.port << "\t";
    for (size_t i = 0; i < c.emulation->classes.size(); ++i) {
      std::cout << (i ? "," : "") << c.emulation->classes[i];
    }
    std::cout << "\n";
  }
  std::cout << "control\t" << host << ":" << simulator.ControlPort() << std::endl;
}

}  // namespace

int main(int argc, char** argv) {
  evwatch::BlockEndSignals();

  CLI::App app{"camsim: simulated network cameras on loopback"};
  evsim::SimOptions options;
  std::string scenario = "none", auth = "none", format = "json", config_file;
  int interval = 500;
  std::optional<double> seconds;
  bool list = false;

  app.add_option("-e,--emulation", options.emulations, "emulation to run (repeatable; default: all)");
  app.add_option("-n,--count", options.count, "cameras of each emulation")->check(CLI::Range(1, 5000));
  app.add_option("--host", options.host, "address to listen on");
  app.add_option("--fixed-port-host", options.fixed_port_host,
                 "address (or auto) for cameras whose TCP service has a fixed port, such as "
                 "LevelOne's 19999; unset: they run without that service");
  app.add_option("--control-port", options.control_port, "control API port (0: a free port)")
      ->check(CLI::Range(0, 65535));
  app.add_option("--scenario", scenario, "demo: motion and inputs change every few seconds")
      ->check(CLI::IsMember({"none", "demo"}));
  app.add_option("--auth", auth, "what the cameras ask of a client")
      ->check(CLI::IsMember({"none", "basic", "digest"}));
  app.add_option("--user", options.user, "user name the cameras accept");
  app.add_option("--password", options.password, "password the cameras accept");
  app.add_option("--duration", seconds, "stop after this many seconds")->check(CLI::PositiveNumber);
  app.add_option("--format", format, "how to print the ports: json or text")
      ->check(CLI::IsMember({"json", "text"}));
  app.add_option("--evwatch-config", config_file, "write an evwatch configuration for these cameras");
  app.add_option("--interval", interval, "default interval of that configuration, ms")
      ->check(CLI::PositiveNumber);
  app.add_flag("--list", list, "list the emulations and exit");

  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp& e) {
    return app.exit(e);
  } catch (const CLI::ParseError& e) {
    std::cerr << "camsim: " << e.what() << " (see camsim --help)" << std::endl;
    return 2;
  }
  if (list) {
    List();
    return 0;
  }
  options.scenario = scenario == "demo";
  options.auth = auth == "basic" ? evsim::AuthScheme::kBasic
                 : auth == "digest" ? evsim::AuthScheme::kDigest
                                    : evsim::AuthScheme::kNone;
  for (const std::string& key : options.emulations) {
    if (evsim::FindEmulation(key) == nullptr) {
      std::cerr << "camsim: unknown emulation \"" << key << "\" (camsim --list shows them)" << std::endl;
      return 2;
    }
  }

  evsim::Simulator simulator;
  std::string error;
  if (!simulator.Start(options, &error)) {
    std::cerr << "camsim: " << error << std::endl;
    return 1;
  }
  if (!config_file.empty()) {
    evsim::SimWatchOptions watch;
    watch.host = options.host;
    if (options.auth != evsim::AuthScheme::kNone) {
      watch.user = options.user;
      watch.password = options.password;
    }
    std::ofstream out(config_file);
    out << evwatch::WatchConfig(evsim::SimWatch(simulator.Cameras(), watch), interval).dump(2) << "\n";
    out.close();
    if (!out) {
      std::cerr << "camsim: cannot write " << config_file << std::endl;
      return 1;
    }
  }
  if (format == "json") {
    nlohmann::json ports = simulator.Describe();
    ports["host"] = options.host;
    std::cout << ports.dump() << std::endl;
  } else {
    PrintText(simulator, options.host);
  }

  evwatch::WaitForEnd(seconds, nullptr);
  simulator.Stop();
  return 0;
}
