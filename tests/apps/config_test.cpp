// The configuration file: what a valid file gives, and every kind of error, both through
// ParseConfig and through `evwatch check` / `evwatch run` (exit status 2, one line naming
// the file, the field and the problem).

#include "apps/evwatch/config.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/apps/apptestutil.h"

namespace evwatch {
namespace {

using evtest::RunToEnd;
using evtest::TempDir;

Config ParseOk(const std::string& text) {
  std::string error;
  std::optional<Config> config = ParseConfig(text, "ok.yaml", &error);
  EXPECT_TRUE(config.has_value()) << error;
  return config.value_or(Config{});
}

TEST(ConfigTest, FullEntryFillsCameraRecordApiAndDetectors) {
  Config c = ParseOk(R"(
interval: 700
cameras:
  - name: door
    host: 10.0.0.5
    port: 8080
    user: admin
    password: "p:w d"
    id: 7
    channel: "2"
    stream_type: 1
    video_type: 3
    api:
      name: zaviovga
      stream: {path: "/video.mjpg", port: 81}
      streams:
        "1,2": {path: "/jpg/image.jpg"}
      md_params: [1, 30, 3, 4]
    motion:
      sensitivity: 80
      threshold: 20
      regions: [{name: r1, left: 0, top: 10, right: 10000, bottom: 9000}]
    frames: {path: "/mjpg"}
    detectors:
      - class: CanonEID
        name: inputs
        interval: 1000
        inputs: 2
      - class: CanonMD
)");
  ASSERT_EQ(c.cameras.size(), 1u);
  EXPECT_EQ(c.interval, 700);
  const CameraConfig& cam = c.cameras[0];
  EXPECT_EQ(cam.name, "door");
  EXPECT_EQ(cam.path, "cameras[0]");
  EXPECT_EQ(cam.record.host, "10.0.0.5");
  EXPECT_EQ(cam.record.port, 8080);
  EXPECT_EQ(cam.record.username, "admin");
  EXPECT_EQ(cam.record.password, "p:w d");
  EXPECT_EQ(cam.record.id, 7);
  EXPECT_EQ(cam.record.channel, "2");
  EXPECT_EQ(cam.record.stream_type, 1);
  EXPECT_EQ(cam.record.video_type, 3);
  EXPECT_EQ(cam.record.sensitivity, 80);
  EXPECT_EQ(cam.record.threshold, 20);
  ASSERT_EQ(cam.record.regions.size(), 1u);
  EXPECT_EQ(cam.record.regions[0].Name(), "r1");
  EXPECT_EQ(cam.record.regions[0].Top(), 10);
  EXPECT_EQ(cam.record.regions[0].Bottom(), 9000);
  EXPECT_EQ(cam.api.api, "zaviovga");
  ASSERT_TRUE(cam.api.stream.has_value());
  EXPECT_EQ(cam.api.stream->path, "/video.mjpg");
  EXPECT_EQ(cam.api.stream->port, 81);
  ASSERT_EQ(cam.api.streams.count({1, 2}), 1u);
  EXPECT_EQ(cam.api.streams.at({1, 2}).path, "/jpg/image.jpg");
  EXPECT_EQ(cam.api.streams.at({1, 2}).port, 8080) << "a stream's port defaults to the camera's";
  EXPECT_EQ(cam.api.md_params, (std::array<int, 4>{1, 30, 3, 4}));
  ASSERT_TRUE(cam.frames.has_value());
  EXPECT_EQ(cam.frames->path, "/mjpg");
  EXPECT_EQ(cam.frames->port, 8080);
  ASSERT_EQ(cam.detectors.size(), 2u);
  EXPECT_EQ(cam.detectors[0].cls, "CanonEID");
  EXPECT_EQ(cam.detectors[0].name, "inputs");
  EXPECT_EQ(cam.detectors[0].interval, 1000);
  EXPECT_EQ(cam.detectors[0].inputs, 2);
  EXPECT_EQ(cam.detectors[0].path, "cameras[0].detectors[0]");
  EXPECT_EQ(cam.detectors[1].name, "CanonMD");
  EXPECT_FALSE(cam.detectors[1].interval.has_value());
  EXPECT_EQ(c.DetectorCount(), 2u);
}

TEST(ConfigTest, DefaultsApply) {
  Config c = ParseOk(R"(
cameras:
  - {name: a, host: h1, detectors: [{class: CanonMD}]}
  - {name: b, host: h2, detectors: [{class: CanonEID}]}
)");
  ASSERT_EQ(c.cameras.size(), 2u);
  EXPECT_EQ(c.interval, 500);
  EXPECT_EQ(c.cameras[0].record.port, 80);
  EXPECT_EQ(c.cameras[0].record.username, "");
  EXPECT_EQ(c.cameras[0].record.password, "");
  EXPECT_EQ(c.cameras[0].record.channel, "1");
  EXPECT_EQ(c.cameras[0].record.id, 1);
  EXPECT_EQ(c.cameras[1].record.id, 2) << "the id defaults to the position, from 1";
  EXPECT_FALSE(c.cameras[0].api.stream.has_value());
  EXPECT_FALSE(c.cameras[0].frames.has_value());
  EXPECT_EQ(c.cameras[1].detectors[0].inputs, 1);
}

TEST(ConfigTest, EveryIntTheConstructorTakesIsPassedOn) {
  Config c = ParseOk(R"(
cameras:
  - name: door
    host: h
    detectors:
      - {class: ZavioEID, inputs: -1}
      - {class: CanonEID, inputs: -7}
      - {class: VivotekJpgMD, function_group: 5}
      - {class: PanaJpgED, type: 7, function_group: 2}
      - {class: DLINKEID, inputs: 2147483647}
)");
  ASSERT_EQ(c.cameras.size(), 1u);
  const std::vector<DetectorConfig>& d = c.cameras[0].detectors;
  ASSERT_EQ(d.size(), 5u);
  EXPECT_EQ(d[0].inputs, -1);
  EXPECT_EQ(d[1].inputs, -7);
  EXPECT_EQ(d[2].function_group, 5);
  EXPECT_EQ(d[3].type, 7);
  EXPECT_EQ(d[3].function_group, 2);
  EXPECT_EQ(d[4].inputs, 2147483647);
}

TEST(ConfigTest, ACountOfNoInputsIsAWarningNotAnError) {
  Config c = ParseOk(R"(
cameras:
  - name: door
    host: h
    detectors:
      - {class: ZavioEID, inputs: -1}
      - {class: ACTiEID, inputs: 0}
      - {class: CanonEID, inputs: -1}
      - {class: AXISEID, inputs: 1}
)");
  // CanonEID's int is not a count (any input line counts): no warning for it.
  ASSERT_EQ(c.warnings.size(), 2u);
  EXPECT_EQ(c.warnings[0],
            "ok.yaml:6: cameras[0].detectors[0].inputs: warning: -1: ZavioEID watches no input with a count "
            "of 0 or below and will never report one active (it runs all the same)");
  EXPECT_NE(c.warnings[1].find("ok.yaml:7: cameras[0].detectors[1].inputs: warning: 0: ACTiEID watches no input"),
            std::string::npos)
      << c.warnings[1];
}

TEST(ConfigTest, JsonIsAccepted) {
  Config c = ParseOk(R"({"interval": 250, "cameras": [{"name": "x", "host": "127.0.0.1", "port": 9000,
      "detectors": [{"class": "CanonEID", "inputs": 3}]}]})");
  ASSERT_EQ(c.cameras.size(), 1u);
  EXPECT_EQ(c.interval, 250);
  EXPECT_EQ(c.cameras[0].record.port, 9000);
  EXPECT_EQ(c.cameras[0].detectors[0].inputs, 3);
}

TEST(ConfigTest, ScalarsReadAsStringsForStringFields) {
  Config c = ParseOk("cameras: [{name: 5, host: h, password: 1234, channel: 3, detectors: [{class: CanonMD}]}]");
  EXPECT_EQ(c.cameras[0].name, "5");
  EXPECT_EQ(c.cameras[0].record.password, "1234");
  EXPECT_EQ(c.cameras[0].record.channel, "3");
}

// One erroneous file: the field path and a piece of the problem that the message must hold.
struct BadCase {
  const char* label;
  std::string yaml;
  std::string field;    // "" for errors about the whole file
  std::string problem;
};

std::string Cam(const std::string& extra, const std::string& detectors = "[{class: CanonMD}]") {
  return "cameras:\n  - {name: door, host: 127.0.0.1, " + extra + (extra.empty() ? "" : ", ") +
         "detectors: " + detectors + "}\n";
}

std::vector<BadCase> BadCases() {
  return {
      {"UnknownTopKey", "intervall: 5\n" + Cam(""), "intervall", "unknown key (did you mean interval?)"},
      {"UnknownCameraKey", Cam("prot: 80"), "cameras[0].prot", "unknown key (did you mean port?)"},
      {"UnknownFarKey", Cam("colour: red"), "cameras[0].colour", "unknown key (known keys: name, host"},
      {"UnknownDetectorKey", Cam("", "[{class: CanonEID, input: 2}]"), "cameras[0].detectors[0].input",
       "unknown key (did you mean inputs?)"},
      {"UnknownApiKey", Cam("api: {nme: x}"), "cameras[0].api.nme", "unknown key"},
      {"UnknownMotionKey", Cam("motion: {sensitivty: 3}"), "cameras[0].motion.sensitivty", "unknown key"},
      {"UnknownRegionKey", Cam("motion: {regions: [{left: 0, top: 0, right: 1, bottom: 1, width: 3}]}"),
       "cameras[0].motion.regions[0].width", "unknown key"},
      {"DuplicateKey", "cameras:\n  - name: door\n    host: h\n    port: 80\n    port: 81\n"
                       "    detectors: [{class: CanonMD}]\n",
       "cameras[0].port", "duplicate key"},
      {"QuotedInteger", Cam("port: \"80\""), "cameras[0].port", "expected an integer, found a string"},
      {"WordForInteger", Cam("port: eighty"), "cameras[0].port", "expected an integer, found \"eighty\""},
      {"FractionForInteger", "interval: 1.5\n" + Cam(""), "interval", "expected an integer"},
      {"ListForInteger", "interval: [1]\n" + Cam(""), "interval", "expected an integer, found a list"},
      {"MapForString", Cam("user: {a: 1}"), "cameras[0].user", "expected a string, found a map"},
      {"NullForString", Cam("password: "), "cameras[0].password", "expected a string, found nothing"},
      {"IntegerOutOfRange", Cam("id: 99999999999"), "cameras[0].id", "out of range"},
      {"StreamBufferForAClassWithoutOne", "cameras:\n  - {name: door, host: h, frames: {path: /m},"
                        " detectors: [{class: CanonEID, stream_buffer: \"yes\"}]}\n",
       "cameras[0].detectors[0].stream_buffer", "CanonEID takes no stream_buffer"},
      {"CamerasNotAList", "cameras: {name: door}\n", "cameras", "expected a list of cameras, found a map"},
      {"DetectorsNotAList", Cam("", "5"), "cameras[0].detectors", "expected a list of detectors"},
      {"CameraNotAMap", "cameras: [door]\n", "cameras[0]", "expected a map, found \"door\""},
      {"TopNotAMap", "- a\n- b\n", "", "expected a map, found a list"},
      {"MissingCameras", "interval: 5\n", "cameras", "missing (required)"},
      {"MissingName", "cameras: [{host: h, detectors: [{class: CanonMD}]}]\n", "cameras[0].name",
       "missing (required)"},
      {"MissingHost", "cameras: [{name: door, detectors: [{class: CanonMD}]}]\n", "cameras[0].host",
       "missing (required)"},
      {"EmptyHost", "cameras: [{name: door, host: \"\", detectors: [{class: CanonMD}]}]\n", "cameras[0].host",
       "must not be empty"},
      {"MissingDetectors", "cameras: [{name: door, host: h}]\n", "cameras[0].detectors", "missing (required)"},
      {"MissingClass", Cam("", "[{name: x}]"), "cameras[0].detectors[0].class", "missing (required)"},
      {"MissingStreamPath", Cam("api: {stream: {port: 80}}"), "cameras[0].api.stream.path",
       "missing (required)"},
      {"MissingRegionCorner", Cam("motion: {regions: [{left: 0, top: 0, right: 5}]}"),
       "cameras[0].motion.regions[0].bottom", "missing (required)"},
      {"EmptyCameraList", "cameras: []\n", "cameras", "the list is empty"},
      {"EmptyDetectorList", Cam("", "[]"), "cameras[0].detectors", "the list is empty"},
      {"EmptyName", "cameras: [{name: \"\", host: h, detectors: [{class: CanonMD}]}]\n", "cameras[0].name",
       "must not be empty"},
      {"DuplicateCameraName",
       "cameras:\n  - {name: door, host: a, detectors: [{class: CanonMD}]}\n"
       "  - {name: door, host: b, detectors: [{class: CanonMD}]}\n",
       "cameras[1].name", "duplicate camera name \"door\""},
      {"DuplicateDetectorName", Cam("", "[{class: CanonMD, name: m}, {class: CanonEID, name: m}]"),
       "cameras[0].detectors[1].name", "duplicate detector name \"m\" in camera \"door\""},
      {"DuplicateDefaultDetectorName", Cam("", "[{class: CanonEID, inputs: 1}, {class: CanonEID, inputs: 2}]"),
       "cameras[0].detectors[1].name", "duplicate detector name \"CanonEID\""},
      {"IntervalZero", "interval: 0\n" + Cam(""), "interval", "must be at least 1"},
      {"IntervalTooLong", "interval: 3000000\n" + Cam(""), "interval",
       "must be at most 2147483 (milliseconds, about 35 minutes), not 3000000"},
      {"DetectorIntervalTooLong", Cam("", "[{class: DLinkMD, interval: 2147484}]"),
       "cameras[0].detectors[0].interval", "must be at most 2147483"},
      {"DetectorIntervalNegative", Cam("", "[{class: CanonMD, interval: -5}]"),
       "cameras[0].detectors[0].interval", "must be at least 1"},
      {"PortZero", Cam("port: 0"), "cameras[0].port", "0 is outside 1..65535"},
      {"PortTooHigh", Cam("port: 65536"), "cameras[0].port", "65536 is outside 1..65535"},
      {"StreamPortTooHigh", Cam("api: {stream: {path: /v, port: 70000}}"), "cameras[0].api.stream.port",
       "outside 1..65535"},
      {"FramesPortZero", Cam("frames: {path: /v, port: 0}"), "cameras[0].frames.port", "outside 1..65535"},
      {"UnknownClass", Cam("", "[{class: CanonMd}]"), "cameras[0].detectors[0].class",
       "unknown class \"CanonMd\" (did you mean \"CanonMD\"?"},
      {"UnknownClassFarOff", Cam("", "[{class: CanonEIDX}]"), "cameras[0].detectors[0].class",
       "did you mean \"CanonEID\"?"},
      {"FieldTheClassDoesNotTake", Cam("", "[{class: CanonMD, inputs: 2}]"), "cameras[0].detectors[0].inputs",
       "CanonMD takes no inputs (its constructor is CanonMD(Camera*))"},
      {"MdParamsShort", Cam("api: {md_params: [1, 2, 3]}"), "cameras[0].api.md_params",
       "expected a list of 4 integers"},
      {"StreamKeyMalformed", Cam("api: {streams: {\"1-2\": {path: /x}}}"), "cameras[0].api.streams[\"1-2\"]",
       "two integers"},
      {"RegionInsideOut", Cam("motion: {regions: [{left: 50, top: 0, right: 10, bottom: 5}]}"),
       "cameras[0].motion.regions[0]", "left is beyond right"},
      {"SensitivityTooHigh", Cam("motion: {sensitivity: 101}"), "cameras[0].motion.sensitivity",
       "outside 0..100"},
      {"EmptyFile", "", "", "the file is empty"},
      {"NotYaml", "cameras: [\n", "", "not valid YAML"},
  };
}

class BadConfigTest : public ::testing::TestWithParam<BadCase> {};

void PrintTo(const BadCase& c, std::ostream* os) { *os << c.label; }

// The message names the field (right after the file and line) and holds the problem.
void ExpectNamesFieldAndProblem(const std::string& message, const BadCase& c) {
  if (!c.field.empty()) {
    EXPECT_NE(message.find(": " + c.field + ": "), std::string::npos) << message;
  }
  EXPECT_NE(message.find(c.problem), std::string::npos) << message;
}

TEST_P(BadConfigTest, ParseNamesFileFieldAndProblem) {
  const BadCase& c = GetParam();
  std::string error;
  EXPECT_FALSE(ParseConfig(c.yaml, "bad.yaml", &error).has_value());
  EXPECT_EQ(error.rfind("bad.yaml", 0), 0u) << error;
  EXPECT_EQ(error.find('\n'), std::string::npos) << error;
  ExpectNamesFieldAndProblem(error, c);
}

TEST_P(BadConfigTest, CheckExitsTwoWithOneLine) {
  const BadCase& c = GetParam();
  TempDir dir;
  const std::string file = dir.Write("bad.yaml", c.yaml);
  evtest::Completed done = RunToEnd({evtest::EvwatchPath(), "check", "-c", file});
  EXPECT_EQ(done.status, 2);
  EXPECT_TRUE(done.out.empty());
  ASSERT_EQ(done.err.size(), 1u);
  const std::string& line = done.err[0];
  EXPECT_EQ(line.rfind("evwatch: " + file, 0), 0u) << line;
  ExpectNamesFieldAndProblem(line, c);
}

INSTANTIATE_TEST_SUITE_P(Errors, BadConfigTest, ::testing::ValuesIn(BadCases()),
                         [](const ::testing::TestParamInfo<BadCase>& info) { return std::string(info.param.label); });

TEST(ConfigCommandTest, RunRejectsABadFileBeforeStartingAnything) {
  TempDir dir;
  const std::string file = dir.Write("bad.yaml", Cam("port: 0"));
  evtest::Completed done = RunToEnd({evtest::EvwatchPath(), "run", "-c", file, "--duration", "30"});
  EXPECT_EQ(done.status, 2);
  EXPECT_TRUE(done.out.empty());
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_NE(done.err[0].find(file), std::string::npos);
  EXPECT_NE(done.err[0].find("cameras[0].port: 0 is outside 1..65535"), std::string::npos) << done.err[0];
}

TEST(ConfigCommandTest, MissingFileIsAConfigurationError) {
  TempDir dir;
  const std::string file = dir.Path() + "/absent.yaml";
  evtest::Completed done = RunToEnd({evtest::EvwatchPath(), "check", "-c", file});
  EXPECT_EQ(done.status, 2);
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_NE(done.err[0].find(file + ": cannot read"), std::string::npos) << done.err[0];
}

TEST(ConfigCommandTest, CheckAcceptsAGoodFile) {
  TempDir dir;
  const std::string file = dir.Write("good.yaml", Cam("port: 8080", "[{class: CanonMD}, {class: CanonEID}]"));
  evtest::Completed done = RunToEnd({evtest::EvwatchPath(), "check", "-c", file});
  EXPECT_EQ(done.status, 0);
  EXPECT_TRUE(done.err.empty());
  ASSERT_EQ(done.out.size(), 1u);
  EXPECT_EQ(done.out[0], file + ": ok: 1 camera(s), 2 detector(s)");
}

TEST(ConfigCommandTest, PasswordNeverAppearsInAMessage) {
  TempDir dir;
  const std::string file = dir.Write("bad.yaml", Cam("password: s3cret-Pw, port: 0"));
  evtest::Completed done = RunToEnd({evtest::EvwatchPath(), "check", "-c", file});
  EXPECT_EQ(done.status, 2);
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_EQ(done.err[0].find("s3cret-Pw"), std::string::npos) << done.err[0];
}

}  // namespace
}  // namespace evwatch
