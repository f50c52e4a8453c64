// Helpers for the tests that run evwatch and camsim as programs: where the programs are,
// a temporary directory, the simulator's control API, and evwatch's JSON lines.
//
// Threads: test thread only.

#ifndef EVWATCH_TESTS_APPS_APPTESTUTIL_H_
#define EVWATCH_TESTS_APPS_APPTESTUTIL_H_

#include <functional>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <vector>

#include "tests/apps/childprocess.h"

namespace evtest {

const std::string& EvwatchPath();
const std::string& CamsimPath();

// A fresh directory, removed with its files when the object goes.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& Path() const { return path_; }
  // Writes `text` to the file `name` in the directory and gives its path.
  std::string Write(const std::string& name, const std::string& text) const;

 private:
  std::string path_;
};

// GET http://127.0.0.1:port/target; the body, or nullopt on any failure or non-2xx answer.
std::optional<std::string> HttpGet(int port, const std::string& target);

// One line of evwatch's jsonl output.
struct ReportLine {
  std::string ts, camera, detector, cls;
  bool state = false;
  int value = 0;
  std::string Key() const { return camera + "/" + detector; }
};
// The line parsed, or nullopt when it is not a report line.
std::optional<ReportLine> ParseReport(const std::string& line);
std::vector<ReportLine> ParseReports(const std::vector<std::string>& lines);
// The reports of each detector ("camera/detector"), in order.
std::map<std::string, std::vector<ReportLine>> ByDetector(const std::vector<std::string>& lines);

// One line of evwatch's text output:
// "YYYY-MM-DD HH:MM:SS.mmm  CAMERA DETECTOR STATE-WORDS level|valid N".
struct TextLine {
  std::string camera, detector;
  std::string words;  // "MOTION", "no motion", "ACTIVE" or "idle"
  std::string label;  // "level" or "valid"
  int value = 0;
  std::string Key() const { return camera + "/" + detector; }
};
// The line parsed, or nullopt when it does not have that form.
std::optional<TextLine> ParseTextLine(const std::string& line);

// camsim running as a child process, with the evwatch configuration it wrote for its
// cameras.
class Camsim {
 public:
  // Starts camsim with `args` (plus --evwatch-config in `dir`) and waits for its ports.
  Camsim(const TempDir& dir, std::vector<std::string> args = {});

  bool Ready() const { return ready_; }
  int ControlPort() const { return control_port_; }
  const nlohmann::json& Cameras() const { return cameras_; }
  const std::string& ConfigPath() const { return config_path_; }
  // The `detectors` entries of the configuration it wrote: "camera/detector" -> class.
  std::map<std::string, std::string> Detectors() const;
  // The configuration it wrote, rewritten into `dir` as `name`: change(entry) may edit each
  // detector entry, and drops it by returning false. Gives the new file's path.
  std::string Rewrite(const TempDir& dir, const std::string& name,
                      const std::function<bool(nlohmann::json& entry)>& change) const;
  // /cameras/NAME/set?QUERY; true when the control API accepted it.
  bool Set(const std::string& camera, const std::string& query) const;
  // The camera's state as the control API gives it.
  nlohmann::json State(const std::string& camera) const;
  ChildProcess& Process() { return *process_; }

 private:
  std::unique_ptr<ChildProcess> process_;
  std::string config_path_;
  bool ready_ = false;
  int control_port_ = 0;
  nlohmann::json cameras_;
};

}  // namespace evtest

#endif  // EVWATCH_TESTS_APPS_APPTESTUTIL_H_
