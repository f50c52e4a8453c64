#include "tests/support/eventrecorder.h"

#include <gtest/gtest.h>

#include <chrono>
#include <sstream>
#include <thread>

namespace evtest {
namespace {

using std::chrono::milliseconds;

TEST(EventRecorderTest, RecordsReportsInOrder) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  buffer.SetStatus(true, 42);
  buffer.SetStatus(false, 0);
  buffer.SetStatus(true, 1);

  EXPECT_EQ(recorder.Size(), 3u);
  EXPECT_EQ(recorder.Reports(),
            (std::vector<Report>{{true, 42}, {false, 0}, {true, 1}}));
}

TEST(EventRecorderTest, SeesOnlyReportsAfterItWasCreated) {
  EventBuf buffer;
  buffer.SetStatus(true, 7);
  EventRecorder recorder(buffer);
  buffer.SetStatus(false, 1);
  EXPECT_EQ(recorder.Reports(), (std::vector<Report>{{false, 1}}));
}

TEST(EventRecorderTest, StopsObservingWhenDestroyed) {
  EventBuf buffer;
  EventRecorder lasting(buffer);
  {
    EventRecorder brief(buffer);
    buffer.SetStatus(true, 1);
    EXPECT_EQ(brief.Size(), 1u);
  }
  buffer.SetStatus(true, 2);  // must not reach the destroyed recorder
  EXPECT_EQ(lasting.Reports(), (std::vector<Report>{{true, 1}, {true, 2}}));
}

TEST(EventRecorderTest, WaitsForReportsFromAnotherThread) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  std::thread reporter([&buffer] {
    for (int i = 1; i <= 5; ++i) {
      std::this_thread::sleep_for(milliseconds(5));
      buffer.SetStatus(i % 2 == 1, i);
    }
  });
  EXPECT_TRUE(recorder.WaitForReport(Report{true, 3}));
  EXPECT_TRUE(recorder.WaitForCount(5));
  EXPECT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) {
    return !r.empty() && r.back() == Report{true, 5};
  }));
  reporter.join();
  EXPECT_EQ(recorder.Size(), 5u);
}

TEST(EventRecorderTest, WaitsGiveUpAtTheDeadline) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  buffer.SetStatus(false, 0);
  EXPECT_FALSE(recorder.WaitForCount(2, milliseconds(50)));
  EXPECT_FALSE(recorder.WaitForReport(Report{true, 100}, milliseconds(50)));
  EXPECT_FALSE(recorder.WaitFor([](const std::vector<Report>&) { return false; },
                                milliseconds(50)));
  EXPECT_TRUE(recorder.WaitForCount(1, milliseconds(50)));
}

TEST(EventRecorderTest, PrintsReadably) {
  std::ostringstream out;
  PrintTo(Report{true, 100}, &out);
  EXPECT_EQ(out.str(), "{state=true, value=100}");
  EXPECT_EQ(::testing::PrintToString(Report{false, 0}), "{state=false, value=0}");
}

}  // namespace
}  // namespace evtest
