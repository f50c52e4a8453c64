// evwatch run against camsim's scene camera, as a user runs them: the software motion
// detector, handed the camera's frame buffer and attached to it by the camera's id, reports
// motion while the simulator's object moves and none while it stands, through the scene's
// changes of light.

#include <signal.h>

#include <gtest/gtest.h>

#include <thread>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

// The reports of every detector since line `from` of the output.
std::map<std::string, std::vector<ReportLine>> Since(const std::vector<std::string>& lines,
                                                     size_t from) {
  return ByDetector(std::vector<std::string>(
      lines.begin() + static_cast<long>(std::min(from, lines.size())), lines.end()));
}

TEST(JpegDiffMDIntegrationTest, MotionWhileTheSimulatorsMotionIsOnAndNoneWhileOff) {
  TempDir dir;
  Camsim sim(dir, {"-e", "scene"});
  ASSERT_TRUE(sim.Ready());
  const std::map<std::string, std::string> detectors = sim.Detectors();
  ASSERT_EQ(detectors.size(), 2u);
  const std::string camera = sim.Cameras()[0]["name"].get<std::string>();

  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath(), "--every"});
  ASSERT_TRUE(evwatch.Started());
  auto all = [&](const std::function<bool(const std::vector<ReportLine>&)>& pred, size_t from = 0) {
    return [&detectors, pred, from](const std::vector<std::string>& lines) {
      auto by = Since(lines, from);
      for (const auto& [key, cls] : detectors) {
        if (!by.count(key) || !pred(by[key])) return false;
      }
      return true;
    };
  };
  ASSERT_TRUE(evwatch.WaitForOut(all([](const auto& r) { return r.size() >= 2; }), seconds(60)));

  // Still: the object stands while the light changes every five seconds.
  size_t from = evwatch.Out().size();
  std::this_thread::sleep_for(seconds(7));
  for (const auto& [key, reports] : Since(evwatch.Out(), from)) {
    for (const ReportLine& r : reports)
      EXPECT_FALSE(r.state) << key << " saw motion in a still scene (" << r.value << ")";
  }

  ASSERT_TRUE(sim.Set(camera, "motion=100"));
  from = evwatch.Out().size();
  EXPECT_TRUE(evwatch.WaitForOut(
      all([](const auto& r) { return r.back().state && r.back().value >= 10; }, from), seconds(30)))
      << "no motion while the object moves";

  ASSERT_TRUE(sim.Set(camera, "motion=0"));
  from = evwatch.Out().size();
  ASSERT_TRUE(
      evwatch.WaitForOut(all([](const auto& r) { return !r.back().state; }, from), seconds(30)));
  // Once it has stopped it stays still, through the next change of light.
  from = evwatch.Out().size();
  std::this_thread::sleep_for(seconds(6));
  for (const auto& [key, reports] : Since(evwatch.Out(), from)) {
    for (const ReportLine& r : reports)
      EXPECT_FALSE(r.state) << key << " saw motion after the object stopped";
  }

  evwatch.Signal(SIGTERM);
  ASSERT_EQ(evwatch.Wait(seconds(60)), std::optional<int>(0));
  auto by = ByDetector(evwatch.Out());
  for (const auto& [key, cls] : detectors) {
    ASSERT_TRUE(by.count(key)) << key;
    EXPECT_EQ(by[key].back().cls, "JpegDiffMD");
    EXPECT_FALSE(by[key].back().state);
    EXPECT_EQ(by[key].back().value, 0);
  }
  EXPECT_EQ(evwatch.Err(), (std::vector<std::string>{"evwatch: stopping 2 detectors (at most 30 s) ..."}));
}

}  // namespace
}  // namespace evtest
