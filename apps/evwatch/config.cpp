#include "apps/evwatch/config.h"

#include <yaml-cpp/yaml.h>

#include <cerrno>
#include <charconv>
#include <cstring>
#include <fstream>
#include <set>
#include <sstream>
#include <stdexcept>

#include "apps/common/watchconfig.h"
#include "apps/evwatch/registry.h"
#include "framework/detector.h"

namespace evwatch {
namespace {

// Thrown inside the parser only; LoadConfig and ParseConfig turn it into their error text.
struct Failure : std::runtime_error {
  using std::runtime_error::runtime_error;
};

std::string Quote(const std::string& s) { return "\"" + s + "\""; }

std::string Field(const std::string& path, const std::string& key) {
  return path.empty() ? key : path + "." + key;
}

std::string Index(const std::string& path, size_t i) {
  return path + "[" + std::to_string(i) + "]";
}

std::string TypeName(const YAML::Node& node) {
  switch (node.Type()) {
    case YAML::NodeType::Null: return "nothing";
    case YAML::NodeType::Sequence: return "a list";
    case YAML::NodeType::Map: return "a map";
    case YAML::NodeType::Scalar: return node.Tag() == "!" ? "a string" : "\"" + node.Scalar() + "\"";
    default: return "nothing";
  }
}

class Parser {
 public:
  explicit Parser(std::string file) : file_(std::move(file)) {}

  Config Parse(const YAML::Node& root) {
    Config config;
    config.file = file_;
    if (!root.IsDefined() || root.IsNull()) Fail(root, "", "the file is empty (it needs a cameras: list)");
    CheckMap(root, "", {field::kInterval, field::kCameras});
    if (root[field::kInterval]) config.interval = Interval(root[field::kInterval], field::kInterval);
    const YAML::Node cameras = Required(root, "", field::kCameras);
    if (!cameras.IsSequence()) Fail(cameras, field::kCameras, "expected a list of cameras, found " + TypeName(cameras));
    if (cameras.size() == 0) Fail(cameras, field::kCameras, "the list is empty (at least one camera is needed)");
    std::set<std::string> names;
    for (size_t i = 0; i < cameras.size(); ++i) {
      config.cameras.push_back(ParseCamera(cameras[i], Index(field::kCameras, i), static_cast<int>(i) + 1));
      const CameraConfig& c = config.cameras.back();
      if (!names.insert(c.name).second) {
        Fail(cameras[i]["name"], Field(c.path, "name"), "duplicate camera name " + Quote(c.name));
      }
    }
    config.warnings = warnings_;
    return config;
  }

 private:
  // "FILE:LINE: PATH: " for a message about the node.
  std::string Where(const YAML::Node& at, const std::string& path) const {
    std::string where = file_;
    YAML::Mark mark = at.IsDefined() ? at.Mark() : YAML::Mark::null_mark();
    if (mark.line >= 0) where += ":" + std::to_string(mark.line + 1);
    return where + ": " + (path.empty() ? "" : path + ": ");
  }

  [[noreturn]] void Fail(const YAML::Node& at, const std::string& path, const std::string& problem) {
    throw Failure(Where(at, path) + problem);
  }

  void Warn(const YAML::Node& at, const std::string& path, const std::string& problem) {
    warnings_.push_back(Where(at, path) + "warning: " + problem);
  }

  // The node must be a map whose keys are distinct and all in `allowed`.
  void CheckMap(const YAML::Node& node, const std::string& path, const std::vector<std::string>& allowed) {
    if (!node.IsMap()) Fail(node, path, "expected a map, found " + TypeName(node));
    std::set<std::string> seen;
    for (const auto& kv : node) {
      if (!kv.first.IsScalar()) Fail(kv.first, path, "a key must be a plain name");
      const std::string key = kv.first.Scalar();
      const std::string at = Field(path, key);
      if (std::find(allowed.begin(), allowed.end(), key) == allowed.end()) {
        std::string nearest = NearestName(key, allowed);
        std::string hint = EditDistance(key, nearest) <= 2 ? " (did you mean " + nearest + "?)" : "";
        std::string known;
        for (const std::string& a : allowed) known += (known.empty() ? "" : ", ") + a;
        Fail(kv.first, at, "unknown key" + (hint.empty() ? " (known keys: " + known + ")" : hint));
      }
      if (!seen.insert(key).second) Fail(kv.first, at, "duplicate key");
    }
  }

  YAML::Node Required(const YAML::Node& map, const std::string& path, const std::string& key) {
    YAML::Node node = map[key];
    if (!node) Fail(map, Field(path, key), "missing (required)");
    return node;
  }

  std::string String(const YAML::Node& node, const std::string& path) {
    if (!node.IsScalar()) Fail(node, path, "expected a string, found " + TypeName(node));
    return node.Scalar();
  }

  std::string NonEmptyString(const YAML::Node& node, const std::string& path) {
    std::string s = String(node, path);
    if (s.empty()) Fail(node, path, "must not be empty");
    return s;
  }

  int Int(const YAML::Node& node, const std::string& path) {
    if (!node.IsScalar() || node.Tag() == "!") {
      Fail(node, path, "expected an integer, found " + TypeName(node));
    }
    const std::string& s = node.Scalar();
    int value = 0;
    auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), value);
    if (ec == std::errc::result_out_of_range) Fail(node, path, s + " is out of range");
    if (ec != std::errc() || end != s.data() + s.size()) {
      Fail(node, path, "expected an integer, found " + TypeName(node));
    }
    return value;
  }

  int IntIn(const YAML::Node& node, const std::string& path, int low, int high) {
    int value = Int(node, path);
    if (value < low || value > high) {
      Fail(node, path, std::to_string(value) + " is outside " + std::to_string(low) + ".." + std::to_string(high));
    }
    return value;
  }

  int Interval(const YAML::Node& node, const std::string& path) {
    int value = Int(node, path);
    if (value < 1) Fail(node, path, "must be at least 1 (milliseconds), not " + std::to_string(value));
    if (value > kMaxIntervalMillis) {
      Fail(node, path, "must be at most " + std::to_string(kMaxIntervalMillis) +
                           " (milliseconds, about 35 minutes), not " + std::to_string(value));
    }
    return value;
  }

  int Port(const YAML::Node& node, const std::string& path) { return IntIn(node, path, 1, 65535); }

  bool Bool(const YAML::Node& node, const std::string& path) {
    bool value = false;
    if (!node.IsScalar() || node.Tag() == "!" || !YAML::convert<bool>::decode(node, value)) {
      Fail(node, path, "expected true or false, found " + TypeName(node));
    }
    return value;
  }

  // {path: ..., port: ...}; the port defaults to the camera's.
  StreamLocation Location(const YAML::Node& node, const std::string& path, int default_port) {
    CheckMap(node, path, {"path", "port"});
    StreamLocation loc;
    loc.path = NonEmptyString(Required(node, path, "path"), Field(path, "path"));
    loc.port = node["port"] ? Port(node["port"], Field(path, "port")) : default_port;
    return loc;
  }

  CameraConfig ParseCamera(const YAML::Node& node, const std::string& path, int position) {
    CheckMap(node, path,
             {field::kName, field::kHost, field::kPort, field::kUser, field::kPassword, field::kId, "channel", "stream_type",
              "video_type", field::kApi, "motion", field::kFrames, field::kDetectors});
    CameraConfig c;
    c.path = path;
    c.name = NonEmptyString(Required(node, path, field::kName), Field(path, field::kName));
    CameraRecord& r = c.record;
    r.host = NonEmptyString(Required(node, path, field::kHost), Field(path, field::kHost));
    if (node[field::kPort]) r.port = Port(node[field::kPort], Field(path, field::kPort));
    if (node[field::kUser]) r.username = String(node[field::kUser], Field(path, field::kUser));
    if (node[field::kPassword]) r.password = String(node[field::kPassword], Field(path, field::kPassword));
    r.id = node[field::kId] ? IntIn(node[field::kId], Field(path, field::kId), 0, 1 << 30) : position;
    if (node["channel"]) r.channel = String(node["channel"], Field(path, "channel"));
    if (node["stream_type"]) r.stream_type = IntIn(node["stream_type"], Field(path, "stream_type"), 0, 1 << 30);
    if (node["video_type"]) r.video_type = IntIn(node["video_type"], Field(path, "video_type"), 0, 1 << 30);
    if (node[field::kApi]) c.api = ParseApi(node[field::kApi], Field(path, field::kApi), r.port);
    if (node["motion"]) ParseMotion(node["motion"], Field(path, "motion"), &r);
    if (node[field::kFrames]) c.frames = Location(node[field::kFrames], Field(path, field::kFrames), r.port);

    const std::string dpath = Field(path, field::kDetectors);
    const YAML::Node list = Required(node, path, field::kDetectors);
    if (!list.IsSequence()) Fail(list, dpath, "expected a list of detectors, found " + TypeName(list));
    if (list.size() == 0) Fail(list, dpath, "the list is empty (at least one detector is needed)");
    std::set<std::string> names;
    for (size_t i = 0; i < list.size(); ++i) {
      c.detectors.push_back(ParseDetector(list[i], Index(dpath, i), c));
      const DetectorConfig& d = c.detectors.back();
      if (!names.insert(d.name).second) {
        Fail(list[i], Field(d.path, field::kName),
             "duplicate detector name " + Quote(d.name) + " in camera " + Quote(c.name) +
                 (list[i][field::kName] ? "" : " (the name defaults to the class name; give each entry a name)"));
      }
    }
    return c;
  }

  CameraAPIRecord ParseApi(const YAML::Node& node, const std::string& path, int camera_port) {
    CheckMap(node, path, {"name", "stream", "streams", "md_params"});
    CameraAPIRecord api;
    if (node["name"]) api.api = String(node["name"], Field(path, "name"));
    if (node["stream"]) api.stream = Location(node["stream"], Field(path, "stream"), camera_port);
    if (const YAML::Node streams = node["streams"]) {
      const std::string spath = Field(path, "streams");
      if (!streams.IsMap()) Fail(streams, spath, "expected a map of \"a,b\": {path, port}, found " + TypeName(streams));
      for (const auto& kv : streams) {
        const std::string key = kv.first.IsScalar() ? kv.first.Scalar() : "";
        const std::string kpath = spath + "[" + Quote(key) + "]";
        std::pair<int, int> pair;
        if (!ParsePair(key, &pair)) Fail(kv.first, kpath, "the key must be two integers \"a,b\" as PrepareStream(a, b) takes them");
        if (api.streams.count(pair)) Fail(kv.first, kpath, "duplicate stream key");
        api.streams[pair] = Location(kv.second, kpath, camera_port);
      }
    }
    if (const YAML::Node md = node["md_params"]) {
      const std::string mpath = Field(path, "md_params");
      if (!md.IsSequence() || md.size() != 4) Fail(md, mpath, "expected a list of 4 integers, found " + TypeName(md));
      for (size_t i = 0; i < 4; ++i) api.md_params[i] = Int(md[i], Index(mpath, i));
    }
    return api;
  }

  static bool ParsePair(const std::string& key, std::pair<int, int>* out) {
    std::istringstream in(key);
    char comma = 0;
    std::string rest;
    return static_cast<bool>(in >> out->first >> comma >> out->second) && comma == ',' && !(in >> rest);
  }

  void ParseMotion(const YAML::Node& node, const std::string& path, CameraRecord* r) {
    CheckMap(node, path, {"sensitivity", "threshold", "regions"});
    if (node["sensitivity"]) r->sensitivity = IntIn(node["sensitivity"], Field(path, "sensitivity"), 0, 100);
    if (node["threshold"]) r->threshold = IntIn(node["threshold"], Field(path, "threshold"), 0, 100);
    if (const YAML::Node regions = node["regions"]) {
      const std::string rpath = Field(path, "regions");
      if (!regions.IsSequence()) Fail(regions, rpath, "expected a list of regions, found " + TypeName(regions));
      for (size_t i = 0; i < regions.size(); ++i) {
        const YAML::Node g = regions[i];
        const std::string gpath = Index(rpath, i);
        CheckMap(g, gpath, {"name", "left", "top", "right", "bottom"});
        std::string name = g["name"] ? String(g["name"], Field(gpath, "name")) : "region" + std::to_string(i + 1);
        int v[4];
        const char* keys[4] = {"left", "top", "right", "bottom"};
        for (int k = 0; k < 4; ++k) v[k] = IntIn(Required(g, gpath, keys[k]), Field(gpath, keys[k]), 0, 10000);
        if (v[0] > v[2]) Fail(g, gpath, "left is beyond right");
        if (v[1] > v[3]) Fail(g, gpath, "top is below bottom");
        r->regions.emplace_back(name, v[0], v[1], v[2], v[3]);
      }
    }
  }

  DetectorConfig ParseDetector(const YAML::Node& node, const std::string& path, const CameraConfig& camera) {
    CheckMap(node, path, {field::kClass, field::kName, field::kInterval, "inputs", "function_group", "type", "stream_buffer"});
    DetectorConfig d;
    d.path = path;
    const YAML::Node cls = Required(node, path, field::kClass);
    d.cls = String(cls, Field(path, field::kClass));
    const DetectorClass* info = FindDetectorClass(d.cls);
    if (info == nullptr) {
      std::vector<std::string> names;
      for (const DetectorClass& c : DetectorClasses()) names.push_back(c.name);
      Fail(cls, Field(path, field::kClass),
           "unknown class " + Quote(d.cls) + " (did you mean " + Quote(NearestName(d.cls, names)) +
               "? `evwatch classes` lists them)");
    }
    d.name = node[field::kName] ? NonEmptyString(node[field::kName], Field(path, field::kName)) : d.cls;
    if (node[field::kInterval]) d.interval = Interval(node[field::kInterval], Field(path, field::kInterval));

    auto taken = [&](const char* key, ConfigField field) {
      const YAML::Node value = node[key];
      if (value && !info->Takes(field)) {
        Fail(value, Field(path, key), d.cls + " takes no " + key + " (its constructor is " + info->constructor + ")");
      }
      return value;
    };
    // Every int the constructor takes is passed on: the class defines what it does with it.
    if (const YAML::Node v = taken("inputs", kFieldInputs)) {
      d.inputs = Int(v, Field(path, "inputs"));
      if (info->counts_inputs && d.inputs <= 0) {
        Warn(v, Field(path, "inputs"), std::to_string(d.inputs) + ": " + d.cls +
                                           " watches no input with a count of 0 or below and will never report "
                                           "one active (it runs all the same)");
      }
    }
    if (const YAML::Node v = taken("function_group", kFieldFunctionGroup)) {
      d.function_group = Int(v, Field(path, "function_group"));
    }
    if (const YAML::Node v = taken("type", kFieldType)) d.type = Int(v, Field(path, "type"));
    if (const YAML::Node v = taken("stream_buffer", kFieldStreamBuffer)) {
      d.stream_buffer = Bool(v, Field(path, "stream_buffer"));
      if (d.stream_buffer && !camera.frames) {
        Fail(v, Field(path, "stream_buffer"), "true needs the camera's frames: source to fill the buffer");
      }
    }
    return d;
  }

  const std::string file_;
  std::vector<std::string> warnings_;
};

}  // namespace

size_t Config::DetectorCount() const {
  size_t n = 0;
  for (const CameraConfig& c : cameras) n += c.detectors.size();
  return n;
}

std::optional<Config> ParseConfig(const std::string& text, const std::string& file, std::string* error) {
  try {
    YAML::Node root = YAML::Load(text);
    return Parser(file).Parse(root);
  } catch (const Failure& f) {
    *error = f.what();
  } catch (const YAML::Exception& e) {
    std::string where = file;
    if (e.mark.line >= 0) where += ":" + std::to_string(e.mark.line + 1) + ":" + std::to_string(e.mark.column + 1);
    *error = where + ": not valid YAML: " + e.msg;
  }
  return std::nullopt;
}

std::optional<Config> LoadConfig(const std::string& file, std::string* error) {
  std::ifstream in(file, std::ios::binary);
  if (!in) {
    *error = file + ": cannot read: " + std::strerror(errno);
    return std::nullopt;
  }
  std::ostringstream text;
  text << in.rdbuf();
  if (in.bad()) {
    *error = file + ": cannot read: " + std::strerror(errno);
    return std::nullopt;
  }
  return ParseConfig(text.str(), file, error);
}

}  // namespace evwatch
