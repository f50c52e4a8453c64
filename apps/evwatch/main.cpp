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
#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <nlohmann/json.hpp>
#include <iostream>
#include <optional>
#include <string>

#include "apps/common/endwait.h"
#include "apps/evwatch/config.h"
#include "apps/evwatch/demo.h"
#include "apps/evwatch/health.h"
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

// SIGHUP: reads the file again; a file that does not pass the checks changes nothing.
void Reload(const std::string& file, evwatch::Runner& runner, evwatch::CameraHealth& health) {
  std::optional<evwatch::Config> next = Load(file);
  if (!next) {
    std::cerr << "evwatch: reload: the file has errors; everything keeps running as it was" << std::endl;
    return;
  }
  health.Update(*next);
  std::string error;
  const evwatch::Runner::Change change = runner.Apply(std::move(*next), &error);
  std::cerr << "evwatch: reloaded " << file << ": " << change.kept << " detectors kept, " << change.stopped
            << " stopped, " << change.started << " started" << std::endl;
  if (!change.ok) std::cerr << "evwatch: reload: " << error << std::endl;
}

int Run(const std::string& file, bool every, std::optional<double> seconds, const std::string& format) {
  std::optional<evwatch::Config> config = Load(file);
  if (!config) return kExitUsage;
  evwatch::Sink sink(std::cout, format == "text" ? evwatch::OutputFormat::kText : evwatch::OutputFormat::kJsonl,
                     every);
  // Camera health goes to stderr as our host's transfers report it.
  evwatch::CameraHealth health(*config, std::cerr);
  sink.SetFailing([&health](const std::string& camera) { return health.Failing(camera); });
  SetTransferObserver([&health](const TransferOutcome& outcome) { health.OnTransfer(outcome); });
  struct ObserverEnd {
    ~ObserverEnd() { SetTransferObserver(nullptr); }
  } observer_end;
  evwatch::Runner runner(*config, sink, std::cerr);
  std::string error;
  if (!runner.Start(&error)) {
    std::cerr << "evwatch: " << error << std::endl;
    return kExitFailure;
  }
  std::optional<evwatch::EndClock::time_point> deadline;
  if (seconds) {
    deadline = evwatch::EndClock::now() +
               std::chrono::duration_cast<evwatch::EndClock::duration>(std::chrono::duration<double>(*seconds));
  }
  evwatch::EndReason end;
  while ((end = evwatch::WaitForEnd(deadline, [&sink] { return sink.Failed(); })) == evwatch::EndReason::kReload) {
    Reload(file, runner, health);
  }
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

// text as lines of at most `columns` characters, each beginning with `indent`, broken at
// blanks (a word longer than a line is not broken).
std::string Wrapped(const std::string& text, const std::string& indent, size_t columns) {
  std::string out, line = indent;
  size_t at = 0;
  while (at < text.size()) {
    size_t end = text.find(' ', at);
    if (end == std::string::npos) end = text.size();
    const std::string word = text.substr(at, end - at);
    if (line.size() > indent.size() && line.size() + 1 + word.size() > columns) {
      out += line + '\n';
      line = indent;
    }
    line += (line.size() > indent.size() ? " " : "") + word;
    at = end + 1;
  }
  return out + line + '\n';
}

// `evwatch classes`: a table that fits 100 columns (the constructor and the whole of how the
// camera is asked with --wide), or JSON for programs.
int Classes(bool wide, const std::string& format) {
  const auto& classes = evwatch::DetectorClasses();
  if (format == "json") {
    nlohmann::ordered_json list = nlohmann::ordered_json::array();
    for (const auto& c : classes) {
      list.push_back({{"class", c.name}, {"maker", c.maker}, {"kind", evwatch::KindName(c.kind)},
                      {"constructor", c.constructor}, {"fields", FieldNames(c)}, {"how", c.how}});
    }
    std::cout << list.dump(2) << std::endl;
    return kExitOk;
  }
  std::vector<std::vector<std::string>> rows = {{"CLASS", "MAKER", "KIND", "FIELDS", "HOW THE CAMERA IS ASKED"}};
  if (wide) rows[0].insert(rows[0].begin() + 3, "CONSTRUCTOR");
  for (const auto& c : classes) {
    rows.push_back({c.name, c.maker, evwatch::KindName(c.kind), FieldNames(c), c.how});
    if (wide) rows.back().insert(rows.back().begin() + 3, c.constructor);
  }
  std::vector<size_t> width(rows[0].size(), 0);
  for (const auto& r : rows) {
    for (size_t i = 0; i + 1 < r.size(); ++i) width[i] = std::max(width[i], r[i].size());
  }
  for (const auto& r : rows) {
    std::string line;
    for (size_t i = 0; i + 1 < r.size(); ++i) line += r[i] + std::string(width[i] + 2 - r[i].size(), ' ');
    if (wide) {
      std::cout << line << r.back() << '\n';
      continue;
    }
    // Narrow: how the camera is asked goes on indented lines below its class.
    line.erase(line.find_last_not_of(' ') + 1);
    std::cout << line << '\n';
    if (&r != &rows[0]) std::cout << Wrapped(r.back(), "    ", 100);
  }
  std::cout << std::flush;
  return kExitOk;
}

// --duration: a number of seconds above 0 that a clock can count to.
std::string CheckSeconds(std::string& text) {
  char* end = nullptr;
  const double seconds = std::strtod(text.c_str(), &end);
  if (end == text.c_str() || *end != '\0' || !std::isfinite(seconds) || seconds <= 0 || seconds > 1e9) {
    return "must be a number of seconds above 0 and at most 1e9, not " + text;
  }
  return "";
}

}  // namespace

int main(int argc, char** argv) {
  evwatch::BlockEndSignals(/*reload=*/true);

  CLI::App app{"evwatch: camera event detectors, run from a configuration file"};
  app.require_subcommand(1);
  app.set_version_flag("--version", "evwatch " EVWATCH_VERSION);
  const CLI::Validator seconds_check(CheckSeconds, "SECONDS");

  std::string file, format = "jsonl";
  bool every = false;
  std::optional<double> run_seconds, demo_seconds;

  CLI::App* run = app.add_subcommand("run", "run the detectors of a configuration and print their readings");
  run->add_option("-c,--config", file, "configuration file (YAML or JSON)")->required();
  run->add_flag("--every", every, "print every reading, not only changes");
  run->add_option("--duration", run_seconds, "stop after this many seconds")->check(seconds_check);
  run->add_option("--format", format, "output format: jsonl (default) or text")
      ->check(CLI::IsMember({"jsonl", "text"}));

  CLI::App* demo = app.add_subcommand("demo", "run every detector class against the built-in simulator");
  demo->add_option("--duration", demo_seconds, "stop after this many seconds")->check(seconds_check);

  CLI::App* classes = app.add_subcommand("classes", "list the detector classes");
  bool wide = false;
  std::string classes_format = "text";
  classes->add_flag("--wide", wide, "show the constructors and the whole of each description");
  classes->add_option("--format", classes_format, "text (default) or json")->check(CLI::IsMember({"text", "json"}));

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
  } catch (const CLI::CallForVersion& e) {
    return app.exit(e);
  } catch (const CLI::ParseError& e) {
    // Point at the help of the command the words were for.
    const bool command = first[0] != '-';
    std::cerr << "evwatch: " << e.what() << " (see evwatch " << (command ? first + " " : "") << "--help)"
              << std::endl;
    return kExitUsage;
  }

  try {
    if (*run) return Run(file, every, run_seconds, format);
    if (*demo) return evwatch::RunDemo(demo_seconds, std::cout, std::cerr);
    if (*classes) return Classes(wide, classes_format);
    if (*check) return Check(file);
  } catch (const std::exception& e) {
    std::cerr << "evwatch: " << e.what() << std::endl;
    return kExitFailure;
  }
  return kExitUsage;
}
