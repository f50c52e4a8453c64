// evwatch run and SIGHUP: the configuration file is read again; removed cameras stop, new ones
// start, an unchanged detector keeps its thread (no second first report), and a file with
// errors leaves everything running.

#include <signal.h>

#include <gtest/gtest.h>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

std::string Joined(const std::vector<std::string>& lines) {
  std::string all;
  for (const std::string& l : lines) all += l + "\n";
  return all;
}

// A configuration watching the named simulated Canon cameras with CanonMD.
std::string Cameras(const Camsim& sim, const std::vector<std::string>& names) {
  std::string text = "cameras:\n";
  for (const auto& camera : sim.Cameras()) {
    const std::string name = camera["name"].get<std::string>();
    if (std::find(names.begin(), names.end(), name) == names.end()) continue;
    text += "  - {name: " + name + ", host: 127.0.0.1, port: " + std::to_string(camera["port"].get<int>()) +
            ", detectors: [{class: CanonMD, name: motion}]}\n";
  }
  return text;
}

size_t Count(const std::vector<std::string>& out, const std::string& key) {
  size_t n = 0;
  for (const ReportLine& r : ParseReports(out)) n += r.Key() == key ? 1 : 0;
  return n;
}

TEST(ReloadTest, SighupStartsAndStopsWhatChangedAndKeepsTheRest) {
  TempDir dir;
  Camsim sim(dir, {"-e", "canon", "-n", "3"});
  ASSERT_TRUE(sim.Ready());
  const std::string file = dir.Write("cams.yaml", Cameras(sim, {"canon1", "canon2"}));
  ChildProcess evwatch({EvwatchPath(), "run", "-c", file});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut(
      [](const auto& l) { return Count(l, "canon1/motion") == 1 && Count(l, "canon2/motion") == 1; }, seconds(60)));

  dir.Write("cams.yaml", Cameras(sim, {"canon1", "canon3"}));
  evwatch.Signal(SIGHUP);
  ASSERT_TRUE(evwatch.WaitForErr(
      [](const auto& l) { return Joined(l).find("evwatch: reloaded") != std::string::npos; }, seconds(60)))
      << Joined(evwatch.Err());
  EXPECT_NE(Joined(evwatch.Err()).find(": 1 detectors kept, 1 stopped, 1 started"), std::string::npos)
      << Joined(evwatch.Err());
  ASSERT_TRUE(evwatch.WaitForOut([](const auto& l) { return Count(l, "canon3/motion") == 1; }, seconds(60)));

  // canon1 kept running: it reports a change, and never a second first report.
  ASSERT_TRUE(sim.Set("canon1", "motion=100"));
  ASSERT_TRUE(sim.Set("canon2", "motion=100"));
  ASSERT_TRUE(evwatch.WaitForOut([](const auto& l) { return Count(l, "canon1/motion") == 2; }, seconds(60)));
  std::vector<ReportLine> canon1;
  for (const ReportLine& r : ParseReports(evwatch.Out())) {
    if (r.Key() == "canon1/motion") canon1.push_back(r);
  }
  ASSERT_EQ(canon1.size(), 2u);
  EXPECT_FALSE(canon1[0].state);
  EXPECT_TRUE(canon1[1].state);
  // canon2 was stopped: its motion is never read.
  for (const ReportLine& r : ParseReports(evwatch.Out())) {
    if (r.Key() == "canon2/motion") {
      EXPECT_FALSE(r.state) << "canon2 still runs after the reload";
    }
  }

  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
}

TEST(ReloadTest, AFileWithErrorsLeavesEverythingRunning) {
  TempDir dir;
  Camsim sim(dir, {"-e", "canon"});
  ASSERT_TRUE(sim.Ready());
  const std::string file = dir.Write("cams.yaml", Cameras(sim, {"canon1"}));
  ChildProcess evwatch({EvwatchPath(), "run", "-c", file});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut([](const auto& l) { return Count(l, "canon1/motion") == 1; }, seconds(60)));

  dir.Write("cams.yaml", "cameras: [{name: canon1, host: 127.0.0.1, detectors: [{class: CanonMd}]}]\n");
  evwatch.Signal(SIGHUP);
  ASSERT_TRUE(evwatch.WaitForErr(
      [](const auto& l) { return Joined(l).find("everything keeps running as it was") != std::string::npos; },
      seconds(60)))
      << Joined(evwatch.Err());
  EXPECT_NE(Joined(evwatch.Err()).find("unknown class \"CanonMd\""), std::string::npos) << Joined(evwatch.Err());

  ASSERT_TRUE(sim.Set("canon1", "motion=100"));
  EXPECT_TRUE(evwatch.WaitForOut([](const auto& l) { return Count(l, "canon1/motion") == 2; }, seconds(60)))
      << "the detector stopped with the bad reload";
  evwatch.Signal(SIGTERM);
  EXPECT_EQ(evwatch.Wait(seconds(60)), 0);
}

}  // namespace
}  // namespace evtest
