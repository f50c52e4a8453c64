#include "tests/apps/apptestutil.h"

#include <stdlib.h>

#include <filesystem>
#include <cctype>
#include <fstream>
#include <sstream>

#include "framework/host/httpclient.h"

namespace evtest {

const std::string& EvwatchPath() {
  static const std::string path = EVWATCH_BIN;
  return path;
}

const std::string& CamsimPath() {
  static const std::string path = CAMSIM_BIN;
  return path;
}

TempDir::TempDir() {
  std::string pattern = (std::filesystem::temp_directory_path() / "evwatch-test-XXXXXX").string();
  if (mkdtemp(pattern.data()) != nullptr) path_ = pattern;
}

TempDir::~TempDir() {
  std::error_code ignored;
  if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
}

std::string TempDir::Write(const std::string& name, const std::string& text) const {
  std::string file = path_ + "/" + name;
  std::ofstream(file, std::ios::binary) << text;
  return file;
}

std::optional<std::string> HttpGet(int port, const std::string& target) {
  VoHttpClient client("127.0.0.1", port, target, "", "", 10);
  int status = 0;
  if (client.SendRequest(VO_HTTP_GET) != 0 || client.CheckResponse(status) != 0) return std::nullopt;
  std::string body;
  char buf[4096];
  int n;
  while ((n = client.ReadData(buf, sizeof buf)) > 0) body.append(buf, static_cast<size_t>(n));
  if (n < 0) return std::nullopt;
  return body;
}

std::optional<ReportLine> ParseReport(const std::string& line) {
  nlohmann::json j = nlohmann::json::parse(line, nullptr, false);
  if (!j.is_object() || !j.contains("camera")) return std::nullopt;
  try {
    ReportLine r;
    r.ts = j.at("ts").get<std::string>();
    r.camera = j.at("camera").get<std::string>();
    r.detector = j.at("detector").get<std::string>();
    r.cls = j.at("class").get<std::string>();
    r.state = j.at("state").get<bool>();
    r.value = j.at("value").get<int>();
    return r;
  } catch (const nlohmann::json::exception&) {
    return std::nullopt;
  }
}

std::vector<ReportLine> ParseReports(const std::vector<std::string>& lines) {
  std::vector<ReportLine> out;
  for (const std::string& l : lines) {
    if (auto r = ParseReport(l)) out.push_back(*r);
  }
  return out;
}

std::map<std::string, std::vector<ReportLine>> ByDetector(const std::vector<std::string>& lines) {
  std::map<std::string, std::vector<ReportLine>> out;
  for (const ReportLine& r : ParseReports(lines)) out[r.Key()].push_back(r);
  return out;
}

namespace {

// Whether text matches a pattern where '9' stands for any digit and every other character
// for itself.
bool MatchesDigits(const std::string& text, const std::string& pattern) {
  if (text.size() != pattern.size()) return false;
  for (size_t i = 0; i < text.size(); ++i) {
    if (pattern[i] == '9' ? !isdigit(static_cast<unsigned char>(text[i])) : text[i] != pattern[i]) return false;
  }
  return true;
}

}  // namespace

std::optional<TextLine> ParseTextLine(const std::string& line) {
  const std::string time_pattern = "9999-99-99 99:99:99.999  ";
  if (line.size() < time_pattern.size() || !MatchesDigits(line.substr(0, time_pattern.size()), time_pattern)) {
    return std::nullopt;
  }
  std::istringstream in(line.substr(time_pattern.size()));
  TextLine t;
  std::string word, rest;
  if (!(in >> t.camera >> t.detector >> word)) return std::nullopt;
  t.words = word;
  if (word == "no") {
    if (!(in >> word) || word != "motion") return std::nullopt;
    t.words = "no motion";
  } else if (word != "MOTION" && word != "ACTIVE" && word != "idle") {
    return std::nullopt;
  }
  if (!(in >> t.label >> t.value) || (t.label != "level" && t.label != "valid") || (in >> rest)) {
    return std::nullopt;
  }
  return t;
}

Camsim::Camsim(const TempDir& dir, std::vector<std::string> args) {
  config_path_ = dir.Path() + "/camsim-evwatch.json";
  std::vector<std::string> argv = {CamsimPath(), "--evwatch-config", config_path_};
  argv.insert(argv.end(), args.begin(), args.end());
  process_ = std::make_unique<ChildProcess>(argv);
  if (!process_->Started()) return;
  if (!process_->WaitForOut([](const std::vector<std::string>& l) { return !l.empty(); },
                            std::chrono::seconds(30))) {
    return;
  }
  nlohmann::json ports = nlohmann::json::parse(process_->Out()[0], nullptr, false);
  if (!ports.is_object() || !ports.contains("control_port")) return;
  control_port_ = ports["control_port"].get<int>();
  cameras_ = ports["cameras"];
  ready_ = control_port_ > 0;
}

std::map<std::string, std::string> Camsim::Detectors() const {
  std::map<std::string, std::string> out;
  std::ifstream in(config_path_);
  nlohmann::json config = nlohmann::json::parse(in, nullptr, false);
  if (!config.is_object()) return out;
  for (const auto& camera : config["cameras"]) {
    for (const auto& d : camera["detectors"]) {
      out[camera["name"].get<std::string>() + "/" + d["name"].get<std::string>()] = d["class"].get<std::string>();
    }
  }
  return out;
}

std::string Camsim::Rewrite(const TempDir& dir, const std::string& name,
                            const std::function<bool(nlohmann::json& entry)>& change) const {
  std::ifstream in(config_path_);
  nlohmann::json config = nlohmann::json::parse(in, nullptr, false);
  if (!config.is_object()) return "";
  for (auto& camera : config["cameras"]) {
    nlohmann::json kept = nlohmann::json::array();
    for (auto& d : camera["detectors"]) {
      if (change(d)) kept.push_back(d);
    }
    camera["detectors"] = kept;
  }
  return dir.Write(name, config.dump(2));
}

bool Camsim::Set(const std::string& camera, const std::string& query) const {
  return HttpGet(control_port_, "/cameras/" + camera + "/set?" + query).has_value();
}

nlohmann::json Camsim::State(const std::string& camera) const {
  std::optional<std::string> body = HttpGet(control_port_, "/cameras/" + camera);
  if (!body) return nullptr;
  return nlohmann::json::parse(*body, nullptr, false);
}

}  // namespace evtest
