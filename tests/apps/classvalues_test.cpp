// evwatch run with constructor values outside the common ones, against camsim: each class does
// what it defines for them (a count of no inputs reads valid and idle, a function group other
// than 0 reads the other record), and a useless count is a warning on stderr, not an error.

#include <signal.h>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

size_t CountSince(const std::vector<ReportLine>& reports, size_t from, bool state) {
  size_t n = 0;
  for (size_t i = from; i < reports.size(); ++i) n += reports[i].state == state ? 1 : 0;
  return n;
}

TEST(ClassValuesTest, UnusualConstructorValuesRunAsTheClassesDefine) {
  TempDir dir;
  Camsim sim(dir, {"-e", "zavio", "-e", "acti", "-e", "vivotek", "-e", "panasonic"});
  ASSERT_TRUE(sim.Ready());
  const std::string config = sim.Rewrite(dir, "unusual.json", [](nlohmann::json& d) {
    const std::string cls = d["class"];
    if (cls == "ZavioEID" || cls == "ACTiEID") d["inputs"] = -1;
    if (cls == "VivotekJpgMD" && d["name"] == "motion") d["function_group"] = 5;
    if (cls == "PanaJpgED" && d["name"] == "input") d["function_group"] = 2;
    return true;
  });

  ChildProcess evwatch({EvwatchPath(), "run", "--every", "-c", config});
  ASSERT_TRUE(evwatch.Started());
  const std::string zavio = "zavio1/inputs", acti = "acti1/inputs", vivotek = "vivotek1/motion",
                    pana = "panasonic1/input";
  ASSERT_TRUE(evwatch.WaitForOut(
      [&](const auto& lines) {
        auto by = ByDetector(lines);
        return by[zavio].size() >= 2 && by[acti].size() >= 2 && by[vivotek].size() >= 2 && by[pana].size() >= 2;
      },
      seconds(60)))
      << "not every detector reported";
  std::map<std::string, size_t> before;
  for (const auto& [key, reports] : ByDetector(evwatch.Out())) before[key] = reports.size();

  for (const auto& camera : sim.Cameras()) ASSERT_TRUE(sim.Set(camera["name"].get<std::string>(), "motion=100&inputs=1"));
  // Group 5 reads the APP2 record, which follows the camera's motion like APP0 does.
  ASSERT_TRUE(evwatch.WaitForOut(
      [&](const auto& lines) {
        auto by = ByDetector(lines);
        return CountSince(by[vivotek], before[vivotek], true) >= 1 && by[zavio].size() >= before[zavio] + 3 &&
               by[acti].size() >= before[acti] + 3 && by[pana].size() >= before[pana] + 3;
      },
      seconds(60)))
      << "VivotekJpgMD with function group 5 saw no motion, or the others stopped reading";

  auto by = ByDetector(evwatch.Out());
  // No inputs to watch: every reading is valid and idle, although the camera's inputs are on.
  for (const std::string& key : {zavio, acti}) {
    EXPECT_EQ(CountSince(by[key], 0, true), 0u) << key;
    for (const ReportLine& r : by[key]) EXPECT_EQ(r.value, 1) << key << ": a valid reading";
  }
  // Another group than 0 or 1: the input is never active.
  EXPECT_EQ(CountSince(by[pana], 0, true), 0u);

  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
  std::string err;
  for (const std::string& line : evwatch.Err()) err += line + "\n";
  EXPECT_NE(err.find("ZavioEID watches no input with a count of 0 or below"), std::string::npos) << err;
  EXPECT_NE(err.find("ACTiEID watches no input with a count of 0 or below"), std::string::npos) << err;
  EXPECT_EQ(err.find("VivotekJpgMD"), std::string::npos) << err;
}

}  // namespace
}  // namespace evtest
