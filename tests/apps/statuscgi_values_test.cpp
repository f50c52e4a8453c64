// evwatch run against camsim with the constructor values of the status-CGI classes that lie
// outside the common ones: BrickcomEID with a negative input count asks nothing and reads
// idle, MobotixMD with a type other than 0 or 1 asks the empty path, and the int that
// MessoaProEID takes and never reads is not a count, so it draws no warning.

#include <signal.h>

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

TEST(StatusCgiValuesTest, UnusualConstructorValuesRunAsTheClassesDefine) {
  TempDir dir;
  Camsim sim(dir, {"-e", "brickcom", "-e", "mobotix", "-e", "messoapro"});
  ASSERT_TRUE(sim.Ready());
  const std::string config = sim.Rewrite(dir, "unusual.json", [](nlohmann::json& d) {
    const std::string cls = d["class"];
    if (cls == "BrickcomEID") d["inputs"] = -1;
    if (cls == "MobotixMD" && d["name"] == "input") d["type"] = 2;
    if (cls == "MessoaProEID") d["inputs"] = -5;
    return true;
  });
  ASSERT_TRUE(sim.Set("all", "motion=100&inputs=1"));

  ChildProcess evwatch({EvwatchPath(), "run", "-c", config});
  ASSERT_TRUE(evwatch.Started());
  const std::string brickcom = "brickcom1/inputs", mobotix = "mobotix1/input", messoapro = "messoapro1/input";
  // MessoaProEID reads the active input whatever its int; the Mobotix entry fails every pass.
  ASSERT_TRUE(evwatch.WaitForOut(
      [&](const auto& lines) {
        auto by = ByDetector(lines);
        return !by[brickcom].empty() && !by[mobotix].empty() && !by[messoapro].empty() && by[messoapro].back().state;
      },
      seconds(60)))
      << "not every detector reported";
  const uint64_t mobotix_requests = sim.State("mobotix1")["state"]["requests"].get<uint64_t>();

  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
  auto by = ByDetector(evwatch.Out());
  // No input asked: valid idle readings (change-only output: one line), then the final one.
  ASSERT_EQ(by[brickcom].size(), 2u);
  EXPECT_FALSE(by[brickcom][0].state);
  EXPECT_EQ(by[brickcom][0].value, 1);
  EXPECT_EQ(sim.State("brickcom1")["state"]["requests"].get<uint64_t>(), 0u);
  // Type 2 asks "/", which the camera does not serve: failed readings only.
  for (const ReportLine& r : by[mobotix]) {
    EXPECT_FALSE(r.state);
    EXPECT_EQ(r.value, 0);
  }
  EXPECT_GE(mobotix_requests, 1u);

  std::string err;
  for (const std::string& line : evwatch.Err()) err += line + "\n";
  EXPECT_NE(err.find("BrickcomEID watches no input with a count of 0 or below"), std::string::npos) << err;
  EXPECT_EQ(err.find("MessoaProEID"), std::string::npos) << err;
}

}  // namespace
}  // namespace evtest
