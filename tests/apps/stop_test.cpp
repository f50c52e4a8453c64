// How evwatch run stops: at once after --duration or a signal even when a detector paces by a
// long interval (the host wakes its timer), with one line on stderr after a signal, and at
// once with status 128 + signal on a second signal while a stop waits for the network.

#include <signal.h>

#include <gtest/gtest.h>

#include <thread>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

// camsim's D-Link camera, watched by DLinkMD alone with the given interval.
std::string DLinkMotionOnly(const Camsim& sim, const TempDir& dir, int interval) {
  return sim.Rewrite(dir, "dlink.json", [interval](nlohmann::json& d) {
    d["interval"] = interval;
    return d["class"] == "DLinkMD";
  });
}

std::string Joined(const std::vector<std::string>& lines) {
  std::string all;
  for (const std::string& l : lines) all += l + "\n";
  return all;
}

TEST(StopTest, DurationEndsARunWhoseDetectorWaitsAMinute) {
  TempDir dir;
  Camsim sim(dir, {"-e", "dlink"});
  ASSERT_TRUE(sim.Ready());
  ChildProcess evwatch({EvwatchPath(), "run", "--duration", "3", "-c", DLinkMotionOnly(sim, dir, 60000)});
  ASSERT_TRUE(evwatch.Started());
  // Before, the stop waited out the rest of the minute; the bound leaves a wide margin.
  std::optional<int> status = evwatch.Wait(seconds(30));
  ASSERT_TRUE(status.has_value()) << "evwatch ran on after --duration 3 with a 60 s interval";
  EXPECT_EQ(*status, 0);
  // Change-only output: the first reading, and the final (false, 0) where it differs.
  std::vector<ReportLine> reports = ParseReports(evwatch.Out());
  ASSERT_GE(reports.size(), 1u) << Joined(evwatch.Out());
  EXPECT_FALSE(reports.back().state);
  EXPECT_EQ(reports.back().value, 0);
}

TEST(StopTest, SigtermEndsTheLongestIntervalAndSaysWhatItStops) {
  TempDir dir;
  Camsim sim(dir, {"-e", "dlink"});
  ASSERT_TRUE(sim.Ready());
  ChildProcess evwatch({EvwatchPath(), "run", "-c", DLinkMotionOnly(sim, dir, 2147483)});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut([](const auto& lines) { return !ParseReports(lines).empty(); }, seconds(30)));
  evwatch.Signal(SIGTERM);
  std::optional<int> status = evwatch.Wait(seconds(30));
  ASSERT_TRUE(status.has_value()) << "evwatch did not end after SIGTERM with a 35-minute interval";
  EXPECT_EQ(*status, 0);
  const std::vector<std::string> err = evwatch.Err();
  ASSERT_EQ(err.size(), 1u) << Joined(err);
  EXPECT_EQ(err[0], "evwatch: stopping 1 detector (at most 30 s) ...");
  EXPECT_FALSE(ParseReports(evwatch.Out()).back().state);
}

TEST(StopTest, SecondSignalEndsAtOnceWithItsStatus) {
  TempDir dir;
  Camsim sim(dir, {"-e", "canon"});
  ASSERT_TRUE(sim.Ready());
  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath()});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut([](const auto& lines) { return ParseReports(lines).size() >= 2; }, seconds(30)));
  // A silent camera holds each detector's request for its whole time-out (30 s for Canon).
  const std::string camera = sim.Cameras()[0]["name"].get<std::string>();
  ASSERT_TRUE(sim.Set(camera, "silent=1"));
  const auto asked = sim.State(camera)["state"]["requests"].get<uint64_t>();
  const auto give_up = std::chrono::steady_clock::now() + seconds(30);
  while (sim.State(camera)["state"]["requests"].get<uint64_t>() < asked + 2) {
    ASSERT_LT(std::chrono::steady_clock::now(), give_up) << "the detectors never asked the silent camera";
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
  }
  const size_t printed = evwatch.Out().size();
  evwatch.Signal(SIGINT);
  ASSERT_TRUE(evwatch.WaitForErr([](const auto& lines) { return !lines.empty(); }, seconds(10)));
  evwatch.Signal(SIGINT);
  std::optional<int> status = evwatch.Wait(seconds(10));
  ASSERT_TRUE(status.has_value()) << "a second SIGINT did not end evwatch";
  EXPECT_EQ(*status, 130);
  EXPECT_EQ(evwatch.Err()[0], "evwatch: stopping 2 detectors (at most 30 s) ...");
  // What was printed before stays printed.
  EXPECT_GE(evwatch.Out().size(), printed);
}

}  // namespace
}  // namespace evtest
