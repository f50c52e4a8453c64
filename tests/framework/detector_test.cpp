#include "framework/detector.h"

#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <thread>

#include "detectors/canon.h"
#include "framework/host/eventbuf.h"
#include "framework/polledloop.h"
#include "tests/support/eventrecorder.h"

namespace {

using evtest::EventRecorder;
using evtest::Report;

// A polled detector whose readings the test scripts, pass by pass.
class ScriptedDetector : public DetectorBase {
 public:
  // Readings handed out in turn; once they run out, every pass blocks until Release().
  explicit ScriptedDetector(std::vector<PassReport> readings) : readings_(std::move(readings)) {}
  ~ScriptedDetector() override { StopIfStarted(); }

  int EventDetecor() override {
    threads_started_++;
    RunPolledLoop(*this, event_buffer_, IntervalMicros(), [this] { return NextReading(); });
    return 0;
  }

  PassReport NextReading() {
    std::unique_lock<std::mutex> lock(mutex_);
    passes_++;
    cv_.notify_all();
    if (next_ < readings_.size()) return readings_[next_++];
    cv_.wait(lock, [this] { return released_; });
    return PassReport{true, 7};
  }

  // Waits until the detector is inside pass n (1-based).
  bool WaitForPass(int n) {
    std::unique_lock<std::mutex> lock(mutex_);
    return cv_.wait_for(lock, std::chrono::seconds(10), [&] { return passes_ >= n; });
  }

  void Release() {
    std::lock_guard<std::mutex> lock(mutex_);
    released_ = true;
    cv_.notify_all();
  }

  int Passes() {
    std::lock_guard<std::mutex> lock(mutex_);
    return passes_;
  }

  std::atomic<int> threads_started_{0};
  EventBuf* Buffer() const { return event_buffer_; }

 private:
  std::mutex mutex_;
  std::condition_variable cv_;
  std::vector<PassReport> readings_;
  size_t next_ = 0;
  int passes_ = 0;
  bool released_ = false;
};

TEST(DetectorBaseTest, ConstructedDefaults) {
  ScriptedDetector detector({});
  EXPECT_EQ(detector.Buffer(), nullptr);
  EXPECT_EQ(detector.Interval(), 500);
  EXPECT_FALSE(detector.IsStarted());
}

TEST(DetectorBaseTest, InitRejectsNullBufferAndNonPositiveInterval) {
  EventBuf buffer;
  ScriptedDetector detector({});
  EXPECT_EQ(detector.Init(nullptr, 500), -1);
  EXPECT_EQ(detector.Init(&buffer, 0), -1);
  EXPECT_EQ(detector.Init(&buffer, -1), -1);
  EXPECT_EQ(detector.Buffer(), nullptr);
  EXPECT_EQ(detector.Interval(), 500);
  EXPECT_EQ(detector.Start(), -1);  // nothing was stored
  EXPECT_EQ(detector.Init(&buffer, 1), 0);
  EXPECT_EQ(detector.Buffer(), &buffer);
  EXPECT_EQ(detector.Interval(), 1);
}

TEST(DetectorBaseTest, InitMayBeCalledAgainBeforeStart) {
  EventBuf first, second;
  ScriptedDetector detector({});
  ASSERT_EQ(detector.Init(&first, 100), 0);
  ASSERT_EQ(detector.Init(&second, 200), 0);
  EXPECT_EQ(detector.Buffer(), &second);
  EXPECT_EQ(detector.Interval(), 200);
}

TEST(DetectorBaseTest, IntervalInMicrosecondsSaturates) {
  ScriptedDetector detector({});
  EventBuf buffer;
  // 3,000,000 ms in microseconds does not fit an int: the conversion stops at the longest.
  ASSERT_EQ(detector.Init(&buffer, 3000000), 0);
  EXPECT_EQ(detector.Interval(), 3000000);
  EXPECT_EQ(detector.IntervalMicros(), kMaxIntervalMillis * 1000);
  ASSERT_EQ(detector.Init(&buffer, INT_MAX), 0);
  EXPECT_EQ(detector.IntervalMicros(), kMaxIntervalMillis * 1000);
  EXPECT_EQ(MillisToMicros(kMaxIntervalMillis + 1), kMaxIntervalMillis * 1000);
}

TEST(DetectorBaseTest, MillisToMicrosKeepsTheUsualRange) {
  EXPECT_EQ(kMaxIntervalMillis, 2147483);
  EXPECT_EQ(MillisToMicros(1), 1000);
  EXPECT_EQ(MillisToMicros(500), 500000);
  EXPECT_EQ(MillisToMicros(kMaxIntervalMillis), 2147483000);
  EXPECT_EQ(MillisToMicros(0), 0);
  EXPECT_EQ(MillisToMicros(-5), 0);
}

TEST(DetectorBaseTest, StartWithoutInitFails) {
  ScriptedDetector detector({});
  EXPECT_EQ(detector.Start(), -1);
  EXPECT_FALSE(detector.IsStarted());
  EXPECT_EQ(detector.threads_started_, 0);
}

TEST(DetectorBaseTest, StopBeforeStartFails) {
  ScriptedDetector detector({});
  EXPECT_EQ(detector.Stop(), -2);
}

TEST(DetectorBaseTest, SecondStartFailsWithoutSecondThread) {
  EventBuf buffer;
  ScriptedDetector detector({});
  ASSERT_EQ(detector.Init(&buffer, 1), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(detector.WaitForPass(1));
  EXPECT_EQ(detector.Start(), -2);
  detector.Release();
  EXPECT_EQ(detector.Stop(), 0);
  EXPECT_EQ(detector.threads_started_, 1);
  EXPECT_EQ(detector.Stop(), -2);  // stopped already
}

TEST(DetectorBaseTest, StartAfterStopRunsANewThread) {
  EventBuf buffer;
  ScriptedDetector detector({});
  ASSERT_EQ(detector.Init(&buffer, 1), 0);
  detector.Release();
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(detector.WaitForPass(1));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_FALSE(detector.IsStarted());
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(detector.threads_started_, 2);
}

TEST(DetectorBaseTest, DeletingAStartedDetectorStopsItFirst) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  auto* detector = new ScriptedDetector({});
  ASSERT_EQ(detector->Init(&buffer, 1), 0);
  detector->Release();
  ASSERT_EQ(detector->Start(), 0);
  ASSERT_TRUE(detector->WaitForPass(2));
  delete detector;  // must join the worker before the object goes away
  // The loop ended through Stop: its final report is (false, 0), and nothing follows it.
  std::vector<Report> reports = recorder.Reports();
  ASSERT_FALSE(reports.empty());
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  size_t count = recorder.Size();
  std::this_thread::sleep_for(std::chrono::milliseconds(20));
  EXPECT_EQ(recorder.Size(), count);
}

TEST(PolledLoopTest, ReportsEveryPassAndAFinalFalse) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ScriptedDetector detector({{true, 40}, {false, 0}, {true, 1}});
  ASSERT_EQ(detector.Init(&buffer, 1), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(detector.WaitForPass(4));  // three scripted passes done, the fourth waits
  ASSERT_TRUE(recorder.WaitForCount(3));
  std::thread stopper([&] { detector.Stop(); });
  while (detector.IsStarted()) std::this_thread::yield();
  detector.Release();  // only now: the blocked pass is the last one
  stopper.join();
  std::vector<Report> reports = recorder.Reports();
  ASSERT_EQ(reports.size(), 5u);
  EXPECT_EQ(reports[0], (Report{true, 40}));
  EXPECT_EQ(reports[1], (Report{false, 0}));
  EXPECT_EQ(reports[2], (Report{true, 1}));
  EXPECT_EQ(reports[3], (Report{true, 7}));  // the pass in progress when Stop came
  EXPECT_EQ(reports[4], (Report{false, 0}));  // the loop's final report
}

TEST(PolledLoopTest, StopWaitsForThePassInProgressAndStartsNoOther) {
  EventBuf buffer;
  ScriptedDetector detector({});
  ASSERT_EQ(detector.Init(&buffer, 1), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(detector.WaitForPass(1));  // blocked inside its first pass
  std::atomic<bool> stopped{false};
  std::thread stopper([&] {
    detector.Stop();
    stopped = true;
  });
  // Stop has cleared the flag once IsStarted() reads false; it cannot return before the
  // pass in progress ends.
  while (detector.IsStarted()) std::this_thread::yield();
  EXPECT_FALSE(stopped);
  detector.Release();
  stopper.join();
  EXPECT_TRUE(stopped);
  EXPECT_EQ(detector.Passes(), 1);
}

TEST(PolledLoopTest, FailedReadingsReportFalseZero) {
  EXPECT_EQ(MotionReport(-1, true, 55).state, false);
  EXPECT_EQ(MotionReport(-1, true, 55).value, 0);
  EXPECT_EQ(MotionReport(0, true, 55).value, 55);
  EXPECT_EQ(InputReport(0, true).value, 1);
  EXPECT_EQ(InputReport(0, false).state, false);
  EXPECT_EQ(InputReport(-1, true).value, 0);
  EXPECT_EQ(InputReport(-1, true).state, false);
}

// A detector that checks its camera returns from its loop at once without reporting, and
// stays started until Stop.
TEST(DetectorBaseTest, NullCameraLoopEndsAtOnceWithoutReports) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  CanonMD detector(nullptr);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  EXPECT_TRUE(detector.IsStarted());
  EXPECT_EQ(detector.Stop(), 0);  // joins the thread that has already returned
  EXPECT_EQ(recorder.Size(), 0u);
  EXPECT_EQ(buffer.Count(), 0u);
}

}  // namespace
