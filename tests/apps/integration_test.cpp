// evwatch run against camsim, both as programs, as a user runs them: for every registered
// class a state set through the simulator's control API shows up as a report, every
// detector's last report after the end is (false, 0), --every against change-only output,
// the text format, credentials, and SIGTERM while every camera has fallen silent.

#include <signal.h>

#include <gtest/gtest.h>

#include <fstream>
#include <set>

#include "apps/evwatch/registry.h"
#include "tests/apps/apptestutil.h"

namespace evtest {
namespace {

using std::chrono::seconds;
using Reports = std::map<std::string, std::vector<ReportLine>>;

// Every detector of `detectors` satisfies pred on its reports.
bool ForAll(const std::vector<std::string>& lines, const std::map<std::string, std::string>& detectors,
            const std::function<bool(const std::vector<ReportLine>&)>& pred) {
  Reports by = ByDetector(lines);
  for (const auto& [key, cls] : detectors) {
    auto it = by.find(key);
    if (it == by.end() || !pred(it->second)) return false;
  }
  return true;
}

// The detectors of `detectors` whose reports fail pred, for a failure message.
std::string Missing(const std::vector<std::string>& lines, const std::map<std::string, std::string>& detectors,
                    const std::function<bool(const std::vector<ReportLine>&)>& pred) {
  Reports by = ByDetector(lines);
  std::string missing;
  for (const auto& [key, cls] : detectors) {
    auto it = by.find(key);
    if (it == by.end() || !pred(it->second)) missing += " " + key;
  }
  return missing;
}

bool SetAll(const Camsim& sim, const std::string& query) {
  bool ok = true;
  for (const auto& camera : sim.Cameras()) ok = sim.Set(camera["name"].get<std::string>(), query) && ok;
  return ok;
}

void ExpectLastReportsAreFinal(const ChildProcess& evwatch, const std::map<std::string, std::string>& detectors) {
  Reports by = ByDetector(evwatch.Out());
  for (const auto& [key, cls] : detectors) {
    ASSERT_TRUE(by.count(key)) << key << " never reported";
    const ReportLine& last = by[key].back();
    EXPECT_FALSE(last.state) << key;
    EXPECT_EQ(last.value, 0) << key;
    EXPECT_EQ(last.cls, cls) << key;
  }
}

TEST(IntegrationTest, EveryClassReportsTheStateSetInTheSimulator) {
  TempDir dir;
  Camsim sim(dir);
  ASSERT_TRUE(sim.Ready());
  const std::map<std::string, std::string> detectors = sim.Detectors();
  std::set<std::string> classes;
  for (const auto& [key, cls] : detectors) classes.insert(cls);
  for (const evwatch::DetectorClass& c : evwatch::DetectorClasses()) {
    EXPECT_EQ(classes.count(c.name), 1u) << c.name << " is not watched in the simulator";
  }

  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath()});
  ASSERT_TRUE(evwatch.Started());
  ASSERT_TRUE(evwatch.WaitForOut([&](const auto& l) { return ForAll(l, detectors, [](auto&) { return true; }); },
                                 seconds(120)))
      << "not every detector reported";

  // The bounds are generous: sixty detectors, and a sanitizer build on a loaded machine.
  ASSERT_TRUE(SetAll(sim, "motion=100&inputs=1"));
  const auto active = [](const std::vector<ReportLine>& r) { return r.back().state; };
  EXPECT_TRUE(evwatch.WaitForOut([&](const auto& l) { return ForAll(l, detectors, active); }, seconds(120)))
      << "not every detector saw motion or an active input:" << Missing(evwatch.Out(), detectors, active);
  for (const auto& [key, reports] : ByDetector(evwatch.Out())) {
    EXPECT_GT(reports.back().value, 0) << key << ": an active reading carries a level or validity";
  }

  ASSERT_TRUE(SetAll(sim, "motion=0&inputs=0"));
  const auto idle_again = [](const std::vector<ReportLine>& r) {
    return r.size() >= 2 && !r.back().state && r[r.size() - 2].state;
  };
  EXPECT_TRUE(evwatch.WaitForOut([&](const auto& l) { return ForAll(l, detectors, idle_again); }, seconds(120)))
      << "not every detector went idle again:" << Missing(evwatch.Out(), detectors, idle_again);

  evwatch.Signal(SIGTERM);
  std::optional<int> status = evwatch.Wait(seconds(120));
  ASSERT_TRUE(status.has_value()) << "evwatch did not end after SIGTERM";
  EXPECT_EQ(*status, 0);
  // Nothing on stderr but the line that says what the signal stops.
  EXPECT_EQ(evwatch.Err(), (std::vector<std::string>{"evwatch: stopping " + std::to_string(detectors.size()) +
                                                     " detectors (at most 30 s) ..."}));
  ExpectLastReportsAreFinal(evwatch, detectors);
}

TEST(IntegrationTest, ChangeOnlyOutputSkipsRepeatsAndEveryKeepsThem) {
  TempDir dir;
  Camsim sim(dir);
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();

  Completed changes = RunToEnd({EvwatchPath(), "run", "-c", sim.ConfigPath(), "--duration", "4"}, seconds(120));
  Completed every =
      RunToEnd({EvwatchPath(), "run", "-c", sim.ConfigPath(), "--duration", "4", "--every"}, seconds(120));
  ASSERT_EQ(changes.status, 0);
  ASSERT_EQ(every.status, 0);

  Reports c = ByDetector(changes.out), e = ByDetector(every.out);
  for (const auto& [key, cls] : detectors) {
    ASSERT_TRUE(c.count(key) && e.count(key)) << key;
    for (size_t i = 1; i < c[key].size(); ++i) {
      EXPECT_TRUE(c[key][i].state != c[key][i - 1].state || c[key][i].value != c[key][i - 1].value)
          << key << ": repeated line without --every";
    }
    // A still camera read about once a second for four seconds: several equal readings.
    bool repeated = false;
    for (size_t i = 1; i < e[key].size(); ++i) {
      repeated = repeated || (e[key][i].state == e[key][i - 1].state && e[key][i].value == e[key][i - 1].value);
    }
    EXPECT_TRUE(repeated) << key << ": --every printed no repeated reading";
    EXPECT_GT(e[key].size(), c[key].size()) << key;
    EXPECT_FALSE(e[key].back().state);
    EXPECT_EQ(e[key].back().value, 0);
    EXPECT_FALSE(c[key].back().state);
    EXPECT_EQ(c[key].back().value, 0);
  }
}

TEST(IntegrationTest, TextFormatIsOneReadableLinePerReport) {
  TempDir dir;
  Camsim sim(dir);
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();
  ASSERT_TRUE(SetAll(sim, "motion=100&inputs=1"));
  Completed done =
      RunToEnd({EvwatchPath(), "run", "-c", sim.ConfigPath(), "--duration", "3", "--format", "text"}, seconds(120));
  ASSERT_EQ(done.status, 0);
  // A class that watches both kinds speaks of the kind that its entry's type chose (0: motion).
  std::map<std::string, int> types;
  std::ifstream in(sim.ConfigPath());
  const nlohmann::json config = nlohmann::json::parse(in, nullptr, false);
  ASSERT_TRUE(config.is_object());
  for (const auto& camera : config["cameras"]) {
    for (const auto& d : camera["detectors"]) {
      types[camera["name"].get<std::string>() + "/" + d["name"].get<std::string>()] = d.value("type", 0);
    }
  }
  std::map<std::string, std::vector<TextLine>> seen;
  for (const std::string& l : done.out) {
    std::optional<TextLine> t = ParseTextLine(l);
    ASSERT_TRUE(t.has_value()) << l;
    seen[t->Key()].push_back(*t);
  }
  for (const auto& [key, cls] : detectors) {
    ASSERT_TRUE(seen.count(key)) << key;
    const evwatch::DetectorKind kind = evwatch::FindDetectorClass(cls)->kind;
    const bool both = kind == evwatch::DetectorKind::kBoth || kind == evwatch::DetectorKind::kBothLevel;
    const bool motion = kind == evwatch::DetectorKind::kMotion || (both && types[key] == 0);
    // The software motion detector's first frame is its reference, no motion yet.
    const size_t reading = cls == "JpegDiffMD" ? 1 : 0;
    ASSERT_GT(seen[key].size(), reading + 1) << key;
    const TextLine& first = seen[key][reading];
    const TextLine& last = seen[key].back();
    EXPECT_EQ(first.words, motion ? "MOTION" : "ACTIVE") << key;
    const bool level = motion || kind == evwatch::DetectorKind::kInputLevel || kind == evwatch::DetectorKind::kBothLevel;
    EXPECT_EQ(first.label, level ? "level" : "valid") << key;
    EXPECT_GT(first.value, 0) << key;
    EXPECT_EQ(last.words, motion ? "no motion" : "idle") << key;
    EXPECT_EQ(last.value, 0) << key;
  }
}

TEST(IntegrationTest, CamerasThatAskForCredentialsAreRead) {
  TempDir dir;
  const std::string password = "pa:ss w0rd@x";
  Camsim sim(dir, {"--auth", "digest", "--user", "admin", "--password", password});
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();
  ASSERT_TRUE(SetAll(sim, "motion=100&inputs=1"));
  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath()});
  EXPECT_TRUE(evwatch.WaitForOut(
      [&](const auto& l) { return ForAll(l, detectors, [](const auto& r) { return r.back().state; }); },
      seconds(60)));
  evwatch.Signal(SIGINT);
  ASSERT_EQ(evwatch.Wait(seconds(120)), std::optional<int>(0));
  for (const auto& lines : {evwatch.Out(), evwatch.Err()}) {
    for (const std::string& l : lines) EXPECT_EQ(l.find(password), std::string::npos) << l;
  }
  ExpectLastReportsAreFinal(evwatch, detectors);
}

TEST(IntegrationTest, SigtermWhileEveryCameraIsSilentEndsAndReportsTheEnd) {
  TempDir dir;
  // Several cameras, each holding several detectors' requests unanswered: stopped one after
  // another, their network time-outs would add up far beyond the deadline below.
  Camsim sim(dir, {"-n", "3"});
  ASSERT_TRUE(sim.Ready());
  const auto detectors = sim.Detectors();
  ASSERT_TRUE(SetAll(sim, "silent=1"));

  ChildProcess evwatch({EvwatchPath(), "run", "-c", sim.ConfigPath()});
  ASSERT_TRUE(evwatch.Started());
  // Wait until every detector's request hangs on its camera.
  const auto deadline = std::chrono::steady_clock::now() + seconds(60);
  for (;;) {
    uint64_t waiting = 0;
    for (const auto& camera : sim.Cameras()) {
      nlohmann::json state = sim.State(camera["name"].get<std::string>());
      if (state.is_object()) waiting += state["state"]["requests"].get<uint64_t>();
    }
    if (waiting >= detectors.size()) break;
    ASSERT_LT(std::chrono::steady_clock::now(), deadline) << "the detectors never asked their cameras";
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
  }

  evwatch.Signal(SIGTERM);
  std::optional<int> status = evwatch.Wait(seconds(100));
  ASSERT_TRUE(status.has_value()) << "evwatch did not end after SIGTERM";
  EXPECT_EQ(*status, 0);
  ExpectLastReportsAreFinal(evwatch, detectors);
}

}  // namespace
}  // namespace evtest
