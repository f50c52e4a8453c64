// evwatch run against camsim's event-service camera, both as programs: the right login reads
// motion and inputs; a wrong one gives failed readings, keeps running, stops cleanly and never
// prints either password.

#include <signal.h>

#include <gtest/gtest.h>

#include <fstream>
#include <sstream>

#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;

constexpr char kPassword[] = "Onvif-Rig7t";

// camsim's configuration with every camera's password replaced.
std::string WithPassword(const TempDir& dir, const Camsim& sim, const std::string& password) {
  std::ifstream in(sim.ConfigPath());
  std::stringstream text;
  text << in.rdbuf();
  nlohmann::json config = nlohmann::json::parse(text.str());
  for (auto& camera : config["cameras"]) camera["password"] = password;
  return dir.Write("login.json", config.dump(2));
}

TEST(OnvifIntegrationTest, WrongPasswordReadsFailuresAndNeverShowsIt) {
  TempDir dir;
  Camsim sim(dir, {"-e", "onvif", "--auth", "digest", "--user", "admin", "--password", kPassword});
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();
  ASSERT_EQ(detectors.size(), 2u);
  ASSERT_TRUE(sim.Set("onvif1", "motion=100&inputs=1"));
  const std::string wrong = "Wr0ng-Onvif";
  ChildProcess evwatch({EvwatchPath(), "run", "--every", "-c", WithPassword(dir, sim, wrong)});
  ASSERT_TRUE(evwatch.Started());
  // Each detector retries after a back-off and reports a failed reading each time.
  EXPECT_TRUE(evwatch.WaitForOut(
      [&](const auto& l) {
        auto by = ByDetector(l);
        for (const auto& [key, cls] : detectors) {
          if (by[key].size() < 2) return false;
        }
        return true;
      },
      seconds(60)));
  evwatch.Signal(SIGINT);
  ASSERT_EQ(evwatch.Wait(seconds(60)), std::optional<int>(0));
  for (const auto& [key, reports] : ByDetector(evwatch.Out())) {
    for (const ReportLine& r : reports) {
      EXPECT_FALSE(r.state) << key;
      EXPECT_EQ(r.value, 0) << key;
    }
  }
  for (const auto& lines : {evwatch.Out(), evwatch.Err()}) {
    for (const std::string& l : lines) {
      EXPECT_EQ(l.find(wrong), std::string::npos) << l;
      EXPECT_EQ(l.find(kPassword), std::string::npos) << l;
    }
  }
}

TEST(OnvifIntegrationTest, RightPasswordReadsMotionAndInput) {
  TempDir dir;
  Camsim sim(dir, {"-e", "onvif", "--auth", "digest", "--user", "admin", "--password", kPassword});
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();
  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath()});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut([&](const auto& l) { return ByDetector(l).size() == detectors.size(); },
                                 seconds(60)));
  ASSERT_TRUE(sim.Set("onvif1", "motion=100&inputs=1"));
  EXPECT_TRUE(evwatch.WaitForOut(
      [&](const auto& l) {
        auto by = ByDetector(l);
        for (const auto& [key, cls] : detectors) {
          if (by[key].empty() || !by[key].back().state) return false;
        }
        return true;
      },
      seconds(60)));
  evwatch.Signal(SIGINT);
  ASSERT_EQ(evwatch.Wait(seconds(60)), std::optional<int>(0));
  for (const auto& [key, reports] : ByDetector(evwatch.Out())) {
    EXPECT_FALSE(reports.back().state) << key;  // the final reading after the stop
  }
}

}  // namespace
}  // namespace evtest
