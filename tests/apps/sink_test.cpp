// The output sink: change filtering, --every, the jsonl and text formats, and ordering under
// reports from many threads.

#include "apps/evwatch/sink.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>
#include <thread>

namespace evwatch {
namespace {

StatusReport At(bool state, int value, int64_t ms = 1700000000123) {
  return StatusReport{state, value, std::chrono::system_clock::time_point(std::chrono::milliseconds(ms))};
}

std::vector<std::string> Lines(const std::string& text) {
  std::vector<std::string> out;
  std::istringstream in(text);
  for (std::string line; std::getline(in, line);) out.push_back(line);
  return out;
}

TEST(SinkTest, JsonLineHoldsEveryFieldInOrder) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, false);
  int h = sink.Add("door", "inputs", "CanonEID", DetectorKind::kInput);
  sink.Report(h, At(true, 1));
  EXPECT_EQ(out.str(),
            "{\"ts\":\"2023-11-14T22:13:20.123Z\",\"camera\":\"door\",\"detector\":\"inputs\","
            "\"class\":\"CanonEID\",\"state\":true,\"value\":1}\n");
}

TEST(SinkTest, NamesAreEscapedInJson) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, false);
  int h = sink.Add("a \"quoted\" cam", "d\\1", "CanonMD", DetectorKind::kMotion);
  sink.Report(h, At(false, 0));
  nlohmann::json j = nlohmann::json::parse(Lines(out.str()).at(0));
  EXPECT_EQ(j["camera"], "a \"quoted\" cam");
  EXPECT_EQ(j["detector"], "d\\1");
}

TEST(SinkTest, WithoutEveryOnlyChangesArePrinted) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, false);
  int h = sink.Add("c", "m", "CanonMD", DetectorKind::kMotion);
  for (auto [state, value] : std::vector<std::pair<bool, int>>{
           {false, 0}, {false, 0}, {true, 100}, {true, 100}, {true, 40}, {false, 0}, {false, 0}}) {
    sink.Report(h, At(state, value));
  }
  std::vector<std::string> lines = Lines(out.str());
  ASSERT_EQ(lines.size(), 4u);
  std::vector<std::pair<bool, int>> seen;
  for (const auto& l : lines) {
    auto j = nlohmann::json::parse(l);
    seen.emplace_back(j["state"].get<bool>(), j["value"].get<int>());
  }
  EXPECT_EQ(seen, (std::vector<std::pair<bool, int>>{{false, 0}, {true, 100}, {true, 40}, {false, 0}}));
}

TEST(SinkTest, ChangesAreJudgedPerDetector) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, false);
  int a = sink.Add("c", "a", "CanonMD", DetectorKind::kMotion);
  int b = sink.Add("c", "b", "CanonMD", DetectorKind::kMotion);
  sink.Report(a, At(true, 100));
  sink.Report(b, At(true, 100));  // b's first report: printed though a said the same
  sink.Report(a, At(true, 100));
  EXPECT_EQ(Lines(out.str()).size(), 2u);
}

TEST(SinkTest, EveryPrintsEachReport) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, true);
  int h = sink.Add("c", "m", "CanonMD", DetectorKind::kMotion);
  for (int i = 0; i < 5; ++i) sink.Report(h, At(false, 0));
  EXPECT_EQ(Lines(out.str()).size(), 5u);
}

TEST(SinkTest, InputWithALevelSaysLevel) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kText, false);
  int h = sink.Add("gate", "inputs", "SanyoEID", DetectorKind::kInputLevel);
  sink.Report(h, At(true, 100));
  std::vector<std::string> lines = Lines(out.str());
  ASSERT_EQ(lines.size(), 1u);
  EXPECT_NE(lines[0].find("ACTIVE"), std::string::npos) << lines[0];
  EXPECT_NE(lines[0].find("level 100"), std::string::npos) << lines[0];
}

TEST(SinkTest, TextSaysStateInWords) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kText, false);
  int m = sink.Add("door", "motion", "CanonMD", DetectorKind::kMotion);
  int i = sink.Add("door", "inputs", "CanonEID", DetectorKind::kInput);
  sink.Report(m, At(true, 100));
  sink.Report(m, At(false, 0));
  sink.Report(i, At(true, 1));
  sink.Report(i, At(false, 0));
  std::vector<std::string> lines = Lines(out.str());
  ASSERT_EQ(lines.size(), 4u);
  const std::string time = LocalTime(At(true, 0).time);
  EXPECT_EQ(lines[0].rfind(time, 0), 0u) << lines[0];
  auto has = [](const std::string& line, const std::vector<std::string>& parts) {
    for (const auto& p : parts) {
      if (line.find(p) == std::string::npos) return false;
    }
    return true;
  };
  EXPECT_TRUE(has(lines[0], {"door", "motion", "MOTION", "level 100"})) << lines[0];
  EXPECT_TRUE(has(lines[1], {"no motion", "level 0"})) << lines[1];
  EXPECT_TRUE(has(lines[2], {"inputs", "ACTIVE", "valid 1"})) << lines[2];
  EXPECT_TRUE(has(lines[3], {"idle", "valid 0"})) << lines[3];
}

TEST(SinkTest, TimesAreFormatted) {
  EXPECT_EQ(IsoTime(At(true, 0, 1700000000123).time), "2023-11-14T22:13:20.123Z");
  EXPECT_EQ(IsoTime(At(true, 0, 1700000000005).time), "2023-11-14T22:13:20.005Z");
  EXPECT_EQ(LocalTime(At(true, 0).time).size(), std::string("2023-11-14 22:13:20.123").size());
}

TEST(SinkTest, ManyThreadsNeitherInterleaveNorReorderADetectorsLines) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, true);
  constexpr int kThreads = 8, kReports = 500;
  std::vector<int> handles;
  for (int t = 0; t < kThreads; ++t) {
    handles.push_back(sink.Add("cam", "d" + std::to_string(t), "CanonMD", DetectorKind::kMotion));
  }
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      for (int n = 0; n < kReports; ++n) sink.Report(handles[t], At(n % 2 == 0, n));
    });
  }
  for (auto& th : threads) th.join();
  std::vector<std::string> lines = Lines(out.str());
  ASSERT_EQ(lines.size(), static_cast<size_t>(kThreads * kReports));
  std::map<std::string, int> next;
  for (const auto& l : lines) {
    nlohmann::json j = nlohmann::json::parse(l, nullptr, false);
    ASSERT_TRUE(j.is_object()) << l;
    const std::string d = j["detector"];
    EXPECT_EQ(j["value"].get<int>(), next[d]) << d;
    next[d] = j["value"].get<int>() + 1;
  }
}

TEST(SinkTest, AFailedWriteIsNoticed) {
  std::ostringstream out;
  Sink sink(out, OutputFormat::kJsonl, false);
  int h = sink.Add("c", "m", "CanonMD", DetectorKind::kMotion);
  EXPECT_FALSE(sink.Failed());
  out.setstate(std::ios::badbit);
  sink.Report(h, At(true, 100));
  EXPECT_TRUE(sink.Failed());
}

}  // namespace
}  // namespace evwatch
