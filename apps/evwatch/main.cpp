// evwatch: runs camera event detectors from a configuration file and prints their readings.
//
//   evwatch run -c FILE [--every] [--duration SECONDS] [--format jsonl|text]
//   evwatch demo [--duration SECONDS]
//   evwatch classes
//   evwatch check -c FILE
//
// Exit status: 0 after a normal end, 2 for a usage or configuration error, 1 for a failure
// at run time.

#include <CLI/CLI.hpp>
#include <iomanip>
#include <iostream>
#include <optional>
#include <string>

#include "apps/common/endwait.h"
#include "apps/evwatch/config.h"
#include "apps/evwatch/demo.h"
#include "apps/evwatch/registry.h"
#include "apps/evwatch/runner.h"
#include "apps/evwatch/sink.h"

namespace {

constexpr int kExitOk = 0;
constexpr int kExitFailure = 1;
constexpr int kExitUsage = 2;

std::optional<evwatch::Config> Load(const std::string& file) {
  std::string error;
  std::optional<evwatch::Config> config = evwatch::LoadConfig(file, &error);
  if (!config) std::cerr << "evwatch: " << error << std::endl;
  if (config) {
    for (const std::string& warning : config->warnings) std::cerr << "evwatch: " << warning << "\n";
    std::cerr << std::flush;
  }
  return config;
}

// Stops every detector. After a signal it says so, since a stop may wait out a network
// time-out; a second signal ends the process at once with what has been printed.
void StopRunner(evwatch::Runner& runner, evwatch::EndReason end) {
  if (end == evwatch::EndReason::kSignal) {
    const size_t n = runner.DetectorCount();
    std::cerr << "evwatch: stopping " << n << (n == 1 ? " detector" : " detectors") << " (at most "
              << evwatch::Runner::kLongestStopSeconds << " s) ..." << std::endl;
  }
  evwatch::RunUnlessSignalled([&runner] { runner.Stop(); }, [](int) { std::cout << std::flush; });
}

int Run(const std::string& file, bool every, std::optional<double> seconds, const std::string& format) {
  std::optional<evwatch::Config> config = Load(file);
  if (!config) return kExitUsage;
  evwatch::Sink sink(std::cout, format == "text" ? evwatch::OutputFormat::kText : evwatch::OutputFormat::kJsonl,
                     every);
  evwatch::Runner runner(std::move(*config), sink, std::cerr);
  std::string error;
  if (!runner.Start(&error)) {
    std::cerr << "evwatch: " << error << std::endl;
    return kExitFailure;
  }
  evwatch::EndReason end = evwatch::WaitForEnd(seconds, [&sink] { return sink.Failed(); });
  StopRunner(runner, end);
  if (end == evwatch::EndReason::kFailed) {
    std::cerr << "evwatch: cannot write the output any more; stopped" << std::endl;
    return kExitFailure;
  }
  return kExitOk;
}

int Check(const std::string& file) {
  std::optional<evwatch::Config> config = Load(file);
  if (!config) return kExitUsage;
  std::cout << file << ": ok: " << config->cameras.size() << " camera(s), " << config->DetectorCount()
            << " detector(s)" << std::endl;
  return kExitOk;
}

std::string FieldNames(const evwatch::DetectorClass& c) {
  static const std::pair<evwatch::ConfigField, const char*> kNames[] = {
      {evwatch::kFieldInputs, "inputs"},
      {evwatch::kFieldFunctionGroup, "function_group"},
      {evwatch::kFieldType, "type"},
      {evwatch::kFieldStreamBuffer, "stream_buffer"},
      {evwatch::kFieldApi, "api"},
  };
  std::string out;
  for (const auto& [field, name] : kNames) {
    if (c.Takes(field)) out += (out.empty() ? "" : ",") + std::string(name);
  }
  return out.empty() ? "-" : out;
}

int Classes() {
  const auto& classes = evwatch::DetectorClasses();
  size_t w[5] = {5, 5, 4, 11, 6};
  for (const auto& c : classes) {
    w[0] = std::max(w[0], c.name.size());
    w[1] = std::max(w[1], c.maker.size());
    w[2] = std::max(w[2], std::string(evwatch::KindName(c.kind)).size());
    w[3] = std::max(w[3], c.constructor.size());
    w[4] = std::max(w[4], FieldNames(c).size());
  }
  auto row = [&](const std::string& a, const std::string& b, const std::string& c, const std::string& d,
                 const std::string& e, const std::string& f) {
    std::cout << std::left << std::setw(w[0] + 2) << a << std::setw(w[1] + 2) << b << std::setw(w[2] + 2) << c
              << std::setw(w[3] + 2) << d << std::setw(w[4] + 2) << e << f << '\n';
  };
  row("CLASS", "MAKER", "KIND", "CONSTRUCTOR", "FIELDS", "HOW THE CAMERA IS ASKED");
  for (const auto& c : classes) row(c.name, c.maker, evwatch::KindName(c.kind), c.constructor, FieldNames(c), c.how);
  std::cout << std::flush;
  return kExitOk;
}

}  // namespace

int main(int argc, char** argv) {
  evwatch::BlockEndSignals();

  CLI::App app{"evwatch: camera event detectors, run from a configuration file"};
  app.require_subcommand(1);

  std::string file, format = "jsonl";
  bool every = false;
  std::optional<double> run_seconds, demo_seconds;

  CLI::App* run = app.add_subcommand("run", "run the detectors of a configuration and print their readings");
  run->add_option("-c,--config", file, "configuration file (YAML or JSON)")->required();
  run->add_flag("--every", every, "print every reading, not only changes");
  run->add_option("--duration", run_seconds, "stop after this many seconds")->check(CLI::PositiveNumber);
  run->add_option("--format", format, "output format: jsonl (default) or text")
      ->check(CLI::IsMember({"jsonl", "text"}));

  CLI::App* demo = app.add_subcommand("demo", "run every detector class against the built-in simulator");
  demo->add_option("--duration", demo_seconds, "stop after this many seconds")->check(CLI::PositiveNumber);

  CLI::App* classes = app.add_subcommand("classes", "list the detector classes");

  CLI::App* check = app.add_subcommand("check", "check a configuration file");
  check->add_option("-c,--config", file, "configuration file (YAML or JSON)")->required();

  // CLI11 would only say that a command is missing; name the word it did not know.
  const std::string first = argc > 1 ? argv[1] : "-";
  if (first[0] != '-' && first != "run" && first != "demo" && first != "classes" && first != "check") {
    std::cerr << "evwatch: unknown command \"" << first << "\" (commands: run, demo, classes, check)"
              << std::endl;
    return kExitUsage;
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp& e) {
    return app.exit(e);
  } catch (const CLI::CallForAllHelp& e) {
    return app.exit(e);
  } catch (const CLI::ParseError& e) {
    std::cerr << "evwatch: " << e.what() << " (see evwatch --help)" << std::endl;
    return kExitUsage;
  }

  try {
    if (*run) return Run(file, every, run_seconds, format);
    if (*demo) return evwatch::RunDemo(demo_seconds, std::cout, std::cerr);
    if (*classes) return Classes();
    if (*check) return Check(file);
  } catch (const std::exception& e) {
    std::cerr << "evwatch: " << e.what() << std::endl;
    return kExitFailure;
  }
  return kExitUsage;
}
