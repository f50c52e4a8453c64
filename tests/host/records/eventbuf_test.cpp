#include "framework/host/eventbuf.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace {

TEST(EventBufTest, KeepsLastReportAndCount) {
  EventBuf buffer;
  EXPECT_EQ(buffer.Count(), 0u);
  EXPECT_FALSE(buffer.Last().state);
  buffer.SetStatus(true, 100);
  buffer.SetStatus(false, 1);
  EXPECT_EQ(buffer.Count(), 2u);
  EXPECT_FALSE(buffer.Last().state);
  EXPECT_EQ(buffer.Last().value, 1);
}

TEST(EventBufTest, ObserversSeeEveryReportInOrderWithItsTime) {
  EventBuf buffer;
  std::vector<StatusReport> seen;
  auto before = std::chrono::system_clock::now();
  int handle = buffer.AddObserver([&](const StatusReport& r) { seen.push_back(r); });
  buffer.SetStatus(true, 37);
  buffer.SetStatus(false, 0);
  buffer.RemoveObserver(handle);
  buffer.SetStatus(true, 5);  // not seen any more
  ASSERT_EQ(seen.size(), 2u);
  EXPECT_TRUE(seen[0].state);
  EXPECT_EQ(seen[0].value, 37);
  EXPECT_FALSE(seen[1].state);
  EXPECT_GE(seen[0].time, before);
  EXPECT_LE(seen[0].time, seen[1].time);
}

TEST(EventBufTest, ManyThreadsReportAtOnce) {
  EventBuf buffer;
  std::vector<int> perThread(8, 0);
  buffer.AddObserver([&](const StatusReport& r) { perThread[r.value]++; });
  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&buffer, t] {
      for (int i = 0; i < 1000; ++i) buffer.SetStatus(i % 2 == 0, t);
    });
  }
  for (auto& t : threads) t.join();
  EXPECT_EQ(buffer.Count(), 8000u);
  for (int count : perThread) EXPECT_EQ(count, 1000);
}

}  // namespace
