#include "apps/evwatch/demo.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <fstream>
#include <nlohmann/json.hpp>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "apps/common/endwait.h"
#include "apps/common/watchconfig.h"
#include "apps/evwatch/config.h"
#include "apps/evwatch/registry.h"
#include "apps/evwatch/runner.h"
#include "apps/evwatch/sink.h"

namespace evwatch {

namespace {

// How long the simulator may take to report its ports.
constexpr int kStartMillis = 20000;

// The camsim to run: $EVWATCH_CAMSIM, else the one beside this program, else the PATH's.
std::string CamsimPath() {
  if (const char* named = std::getenv("EVWATCH_CAMSIM"); named != nullptr && *named != '\0') {
    return named;
  }
  char self[PATH_MAX];
  ssize_t n = readlink("/proc/self/exe", self, sizeof(self) - 1);
  if (n > 0) {
    std::string dir(self, static_cast<size_t>(n));
    dir.erase(dir.rfind('/') + 1);
    std::string beside = dir + "camsim";
    if (access(beside.c_str(), X_OK) == 0) return beside;
  }
  return "camsim";
}

// The simulator as a child process: started with its demo scenario, writing the
// configuration that watches its cameras to a file of a private folder.
class Camsim {
 public:
  ~Camsim() { Stop(); }

  bool Start(std::string* error) {
    char folder[] = "/tmp/evwatch-demo.XXXXXX";
    if (mkdtemp(folder) == nullptr) return Fail("cannot make a temporary folder", error);
    folder_ = folder;
    config_ = folder_ + "/cameras.json";
    const std::string path = CamsimPath();
    int out[2];
    if (pipe2(out, O_CLOEXEC) != 0) return Fail("cannot make a pipe", error);
    pid_ = fork();
    if (pid_ < 0) {
      close(out[0]);
      close(out[1]);
      return Fail("cannot start a process", error);
    }
    if (pid_ == 0) RunChild(path, out[1]);
    close(out[1]);
    std::string line;
    bool read = ReadLine(out[0], &line);
    close(out[0]);
    if (!read) {
      // Silent for the whole start time, or ended: either way it is not coming.
      kill(pid_, SIGTERM);
      return Fail("the camera simulator (" + path + ") did not start" + ChildEnd(), error);
    }
    nlohmann::json ports = nlohmann::json::parse(line, nullptr, false);
    if (!ports.is_object() || !ports["control_port"].is_number_integer()) {
      return Fail("the camera simulator (" + path + ") printed no ports", error);
    }
    control_port_ = ports["control_port"].get<int>();
    return true;
  }

  // The configuration the simulator wrote.
  std::string ConfigText() const {
    std::ifstream in(config_);
    std::stringstream text;
    text << in.rdbuf();
    return text.str();
  }

  int ControlPort() const { return control_port_; }

  void Stop() {
    if (pid_ > 0) {
      kill(pid_, SIGTERM);
      waitpid(pid_, nullptr, 0);
      pid_ = -1;
    }
    if (!config_.empty()) unlink(config_.c_str());
    if (!folder_.empty()) rmdir(folder_.c_str());
    config_.clear();
    folder_.clear();
  }

 private:
  [[noreturn]] void RunChild(const std::string& path, int out) {
    // Its own process group: a Ctrl-C reaches evwatch, which stops its detectors before
    // the cameras; and it ends with evwatch, however evwatch ends.
    setpgid(0, 0);
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    dup2(out, STDOUT_FILENO);
    std::vector<std::string> args = {path, "--scenario", "demo", "--format", "json", "--evwatch-config",
                                     config_};
    std::vector<char*> argv;
    for (std::string& a : args) argv.push_back(a.data());
    argv.push_back(nullptr);
    execvp(argv[0], argv.data());
    _exit(127);
  }

  // The simulator's first line, the description of its ports.
  static bool ReadLine(int fd, std::string* line) {
    char c = 0;
    while (true) {
      pollfd p{fd, POLLIN, 0};
      if (poll(&p, 1, kStartMillis) <= 0) return false;
      if (read(fd, &c, 1) != 1) return false;
      if (c == '\n') return true;
      line->push_back(c);
    }
  }

  // Waits for the child to end and says how it ended.
  std::string ChildEnd() {
    int status = 0;
    if (pid_ <= 0 || waitpid(pid_, &status, 0) != pid_) return "";
    pid_ = -1;
    if (WIFEXITED(status) && WEXITSTATUS(status) == 127) return ": cannot run it (build it, or set EVWATCH_CAMSIM)";
    if (WIFEXITED(status)) return ": exit status " + std::to_string(WEXITSTATUS(status));
    if (WTERMSIG(status) == SIGTERM) return ": no answer within " + std::to_string(kStartMillis / 1000) + " s";
    return ": ended by signal " + std::to_string(WTERMSIG(status));
  }

  bool Fail(const std::string& what, std::string* error) {
    *error = what;
    Stop();
    return false;
  }

  pid_t pid_ = -1;
  std::string folder_;
  std::string config_;
  int control_port_ = 0;
};

// The simulator's configuration with only the detector entries of registered classes; a
// camera left without entries is left out. Collects the classes kept.
std::string KeepRegistered(const std::string& text, std::set<std::string>* kept) {
  nlohmann::ordered_json config = nlohmann::ordered_json::parse(text, nullptr, false);
  if (!config.is_object() || !config[field::kCameras].is_array()) return text;
  nlohmann::ordered_json cameras = nlohmann::ordered_json::array();
  for (nlohmann::ordered_json camera : config[field::kCameras]) {
    nlohmann::ordered_json detectors = nlohmann::ordered_json::array();
    for (const auto& d : camera[field::kDetectors]) {
      const std::string cls = d.value(field::kClass, "");
      if (FindDetectorClass(cls) == nullptr) continue;
      kept->insert(cls);
      detectors.push_back(d);
    }
    if (detectors.empty()) continue;
    camera[field::kDetectors] = std::move(detectors);
    cameras.push_back(std::move(camera));
  }
  config[field::kCameras] = std::move(cameras);
  return config.dump(2);
}

}  // namespace

int RunDemo(std::optional<double> seconds, std::ostream& out, std::ostream& err) {
  Camsim simulator;
  std::string error;
  if (!simulator.Start(&error)) {
    err << "evwatch: demo: simulator: " << error << std::endl;
    return 1;
  }

  std::set<std::string> in_demo;
  const std::string text = KeepRegistered(simulator.ConfigText(), &in_demo);
  std::optional<Config> config = ParseConfig(text, "(demo configuration)", &error);
  if (!config) {
    err << "evwatch: demo: " << error << std::endl;
    return 1;
  }

  out << "evwatch demo: " << config->cameras.size() << " simulated camera(s) on 127.0.0.1, "
      << config->DetectorCount() << " detectors; simulator control API on port "
      << simulator.ControlPort() << ".\n";
  for (const DetectorClass& c : DetectorClasses()) {
    if (in_demo.count(c.name) == 0) {
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
  // A second Ctrl-C while the detectors stop ends the demo at once; the child simulator
  // ends with it.
  RunUnlessSignalled([&runner] { runner.Stop(); }, [&out](int) { out << std::flush; });
  simulator.Stop();
  return 0;
}

}  // namespace evwatch
