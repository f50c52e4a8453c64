// The runner in process, against the simulator library: detectors are built from the
// registry, report through the sink, and all end with their final report on Stop.

#include "apps/evwatch/runner.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>
#include <map>
#include <thread>

#include "apps/evwatch/registry.h"
#include "apps/camsim/simwatch.h"
#include "sim/simulator.h"

namespace evwatch {
namespace {

class RunnerTest : public ::testing::Test {
 protected:
  void SetUp() override {
    evsim::SimOptions options;
    options.emulations = {"canon"};  // two detectors per camera
    options.count = 2;
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
  }
  Config MakeConfig() {
    nlohmann::ordered_json j = WatchConfig(evsim::SimWatch(sim_.Cameras(), {}), 500);
    std::string error;
    std::optional<Config> c = ParseConfig(j.dump(), "sim.json", &error);
    EXPECT_TRUE(c.has_value()) << error;
    return c.value_or(Config{});
  }
  evsim::Simulator sim_;
};

TEST_F(RunnerTest, EveryDetectorReportsAndEndsWithTheFinalReport) {
  // The output is read only after Stop(): no detector writes to it any more.
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, true);
  std::ostringstream log;
  Config config = MakeConfig();
  const size_t expected = config.DetectorCount();
  ASSERT_EQ(expected, 2 * sim_.Cameras().size());
  for (const auto& c : sim_.Cameras()) {
    c.state->SetMotion(100);
    c.state->SetAllInputs(true);
  }

  Runner runner(config, sink, log);
  std::string error;
  ASSERT_TRUE(runner.Start(&error)) << error;
  EXPECT_EQ(runner.DetectorCount(), expected);
  // Each camera is asked once a second by each of its detectors.
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  auto asked = [&] {
    for (const auto& c : sim_.Cameras()) {
      if (c.state->Requests() < 4) return false;
    }
    return true;
  };
  while (!asked() && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
  }
  runner.Stop();
  runner.Stop();  // idempotent
  EXPECT_EQ(runner.DetectorCount(), 0u);

  std::map<std::string, std::vector<nlohmann::json>> by;
  std::istringstream in(out.str());
  for (std::string l; std::getline(in, l);) {
    nlohmann::json j = nlohmann::json::parse(l);
    by[j["camera"].get<std::string>() + "/" + j["detector"].get<std::string>()].push_back(j);
  }
  ASSERT_EQ(by.size(), expected);
  for (const auto& [key, reports] : by) {
    ASSERT_GE(reports.size(), 2u) << key;
    EXPECT_EQ(reports.front()["state"], true) << key;
    EXPECT_EQ(reports.back()["state"], false) << key;
    EXPECT_EQ(reports.back()["value"], 0) << key;
  }
  EXPECT_TRUE(log.str().empty()) << log.str();
}

TEST_F(RunnerTest, DestroyingARunnerStopsItsDetectors) {
  std::ostringstream out, log;
  Sink sink(out, OutputFormat::kJsonl, true);
  {
    Runner runner(MakeConfig(), sink, log);
    std::string error;
    ASSERT_TRUE(runner.Start(&error)) << error;
  }
  // Every detector's last line is its final report.
  std::map<std::string, nlohmann::json> last;
  std::istringstream in(out.str());
  for (std::string l; std::getline(in, l);) {
    nlohmann::json j = nlohmann::json::parse(l);
    last[j["camera"].get<std::string>() + "/" + j["detector"].get<std::string>()] = j;
  }
  ASSERT_EQ(last.size(), 2 * sim_.Cameras().size());
  for (const auto& [key, j] : last) {
    EXPECT_EQ(j["state"], false) << key;
    EXPECT_EQ(j["value"], 0) << key;
  }
}

}  // namespace
}  // namespace evwatch
