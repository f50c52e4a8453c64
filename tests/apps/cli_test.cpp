// evwatch's and camsim's command lines: usage errors, help, and the demo.

#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>

#include "sim/emulation.h"

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

struct Usage {
  const char* label;
  std::vector<std::string> args;
  std::string message;  // a piece of the one line on stderr
};

void PrintTo(const Usage& u, std::ostream* os) { *os << u.label; }

class UsageErrorTest : public ::testing::TestWithParam<Usage> {};

TEST_P(UsageErrorTest, ExitsTwoWithOneLine) {
  std::vector<std::string> argv = {EvwatchPath()};
  argv.insert(argv.end(), GetParam().args.begin(), GetParam().args.end());
  Completed done = RunToEnd(argv);
  EXPECT_EQ(done.status, 2);
  EXPECT_TRUE(done.out.empty());
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_EQ(done.err[0].rfind("evwatch: ", 0), 0u) << done.err[0];
  EXPECT_NE(done.err[0].find(GetParam().message), std::string::npos) << done.err[0];
}

INSTANTIATE_TEST_SUITE_P(
    Cli, UsageErrorTest,
    ::testing::Values(Usage{"NoCommand", {}, "subcommand is required"},
                      Usage{"UnknownCommand", {"start"}, "start"},
                      Usage{"RunWithoutConfig", {"run"}, "--config is required"},
                      Usage{"CheckWithoutConfig", {"check"}, "--config is required"},
                      Usage{"BadFormat", {"run", "-c", "x.yaml", "--format", "xml"}, "xml"},
                      Usage{"NegativeDuration", {"run", "-c", "x.yaml", "--duration", "-1"}, "duration"},
                      Usage{"WordForDuration", {"demo", "--duration", "soon"}, "duration"},
                      Usage{"UnknownOption", {"run", "-c", "x.yaml", "--all"}, "--all"},
                      Usage{"ClassesTakesNoArguments", {"classes", "extra"}, "extra"},
                      Usage{"NanDuration", {"run", "-c", "x.yaml", "--duration", "nan"},
                            "--duration: must be a number of seconds above 0 and at most 1e9, not nan"},
                      Usage{"InfiniteDuration", {"run", "-c", "x.yaml", "--duration", "inf"}, "not inf"},
                      Usage{"ZeroDuration", {"demo", "--duration", "0"}, "not 0 (see evwatch demo --help)"},
                      Usage{"HugeDuration", {"run", "-c", "x.yaml", "--duration", "1e300"}, "not 1e300"},
                      Usage{"SubcommandErrorPointsAtItsHelp", {"run", "-c", "x.yaml", "--all"},
                            "(see evwatch run --help)"}),
    [](const ::testing::TestParamInfo<Usage>& info) { return std::string(info.param.label); });

TEST(CliTest, VersionIsOneLine) {
  Completed done = RunToEnd({EvwatchPath(), "--version"});
  EXPECT_EQ(done.status, 0);
  ASSERT_EQ(done.out.size(), 1u);
  EXPECT_EQ(done.out[0].rfind("evwatch ", 0), 0u) << done.out[0];
  EXPECT_NE(done.out[0].find_first_of("0123456789"), std::string::npos) << done.out[0];
}

TEST(CliTest, DirectoryAsConfigurationSaysSo) {
  TempDir dir;
  Completed done = RunToEnd({EvwatchPath(), "check", "-c", dir.Path()});
  EXPECT_EQ(done.status, 2);
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_EQ(done.err[0], "evwatch: " + dir.Path() + ": is a directory, not a configuration file");
}

TEST(CliTest, HelpExitsZero) {
  Completed done = RunToEnd({EvwatchPath(), "--help"});
  EXPECT_EQ(done.status, 0);
  std::string all;
  for (const auto& l : done.out) all += l + "\n";
  for (const char* command : {"run", "demo", "classes", "check"}) {
    EXPECT_NE(all.find(command), std::string::npos) << command;
  }
}

TEST(CliTest, DemoShowsEventsAndEndsByItself) {
  Completed done = RunToEnd({EvwatchPath(), "demo", "--duration", "10"}, std::chrono::seconds(120));
  ASSERT_EQ(done.status, 0);
  EXPECT_TRUE(done.err.empty()) << done.err[0];
  std::map<std::string, std::string> last;
  bool motion = false, active = false;
  for (const std::string& l : done.out) {
    std::optional<TextLine> t = ParseTextLine(l);
    if (!t) continue;  // the demo's opening lines
    last[t->Key()] = t->words + " " + std::to_string(t->value);
    motion = motion || t->words == "MOTION";
    active = active || t->words == "ACTIVE";
  }
  // It ends with one line that counts the events of each camera.
  ASSERT_FALSE(done.out.empty());
  EXPECT_EQ(done.out.back().rfind("demo: ", 0), 0u) << done.out.back();
  EXPECT_NE(done.out.back().find(" events from "), std::string::npos) << done.out.back();
  EXPECT_TRUE(motion) << "no motion event within the demo's ten seconds";
  EXPECT_TRUE(active) << "no input event within the demo's ten seconds";
  ASSERT_FALSE(last.empty());
  for (const auto& [detector, final] : last) {
    EXPECT_TRUE(final == "no motion 0" || final == "idle 0") << detector << " ended with " << final;
  }
}

TEST(CliTest, DemoWithoutItsSimulatorSaysSoAndFails) {
  Completed done = RunToEnd({"/usr/bin/env", "EVWATCH_CAMSIM=/nonexistent/camsim", EvwatchPath(), "demo",
                             "--duration", "5"},
                            std::chrono::seconds(60));
  EXPECT_EQ(done.status, 1);
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_NE(done.err[0].find("the camera simulator (/nonexistent/camsim) did not start"), std::string::npos)
      << done.err[0];
}

TEST(CamsimCliTest, ListsItsEmulations) {
  Completed done = RunToEnd({CamsimPath(), "--list"});
  ASSERT_EQ(done.status, 0);
  EXPECT_NE(std::find(done.out.begin(), done.out.end(), "canon\tCanon\tCanonMD,CanonEID"), done.out.end());
  EXPECT_EQ(done.out.size(), evsim::Emulations().size());
}

TEST(CamsimCliTest, UnknownEmulationIsAUsageError) {
  Completed done = RunToEnd({CamsimPath(), "-e", "nikon"});
  EXPECT_EQ(done.status, 2);
  ASSERT_EQ(done.err.size(), 1u);
  EXPECT_NE(done.err[0].find("nikon"), std::string::npos);
}

TEST(CamsimCliTest, TextFormatListsCamerasAndControlPortThenEnds) {
  Completed done = RunToEnd({CamsimPath(), "-e", "canon", "-n", "2", "--format", "text", "--duration", "1"});
  ASSERT_EQ(done.status, 0);
  ASSERT_EQ(done.out.size(), 3u);
  auto fields = [](const std::string& line) {
    std::vector<std::string> out;
    std::istringstream in(line);
    for (std::string f; std::getline(in, f, '\t');) out.push_back(f);
    return out;
  };
  auto is_port = [](const std::string& address) {
    const std::string host = "127.0.0.1:";
    return address.rfind(host, 0) == 0 && address.size() > host.size() &&
           address.find_first_not_of("0123456789", host.size()) == std::string::npos;
  };
  for (int n = 0; n < 2; ++n) {
    std::vector<std::string> f = fields(done.out[n]);
    ASSERT_EQ(f.size(), 4u) << done.out[n];
    EXPECT_EQ(f[0], "canon" + std::to_string(n + 1));
    EXPECT_EQ(f[1], "Canon");
    EXPECT_TRUE(is_port(f[2])) << f[2];
    EXPECT_EQ(f[3], "CanonMD,CanonEID");
  }
  std::vector<std::string> control = fields(done.out[2]);
  ASSERT_EQ(control.size(), 2u) << done.out[2];
  EXPECT_EQ(control[0], "control");
  EXPECT_TRUE(is_port(control[1])) << control[1];
}

}  // namespace
}  // namespace evtest
