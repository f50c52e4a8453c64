// RunStreamLoop over a loopback multipart stream: one report per pass and a final (false, 0),
// and the pace of a paced loop, counted on a fake clock instead of measured.

#include "framework/streamloop.h"

#include <gtest/gtest.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "framework/streampart.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::Push;
using evtest::PushHandler;
using evtest::Report;

const char kPath[] = "/stream";

// A detector that says it is started for a given number of loop tests.
class CountedDetector : public DetectorBase {
 public:
  explicit CountedDetector(int passes) : passes_(passes) {}
  bool IsStarted() override { return passes_-- > 0; }
  int EventDetecor() override { return 0; }

 private:
  int passes_;
};

// A clock that never sleeps: it records each wake-up time and moves to it.
class FakeClock : public DelayTimer::Clock {
 public:
  DelayTimer::TimePoint Now() override { return now; }
  void SleepUntil(DelayTimer::TimePoint when) override {
    sleeps.push_back(when - start);
    now = when;
  }
  const DelayTimer::TimePoint start{std::chrono::seconds(100)};
  DelayTimer::TimePoint now = start;
  std::vector<DelayTimer::TimePoint::duration> sleeps;
};

class StreamLoopTest : public ::testing::Test {
 protected:
  void SetUp() override {
    cam_.Handle(kPath, PushHandler({Push{{"1", "2", "3"}, Push::kRepeatLast,
                                         std::chrono::milliseconds(5)}}));
  }
  // Runs three passes; each reports (true, the part's digit).
  std::vector<Report> RunThreePasses(const StreamLoopShape& shape) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    CountedDetector detector(3);
    RunStreamLoop(detector, &buffer, camera_, kPath, cam_.Port(), shape,
                  [](MultipartFetch* fetch) -> std::optional<PassReport> {
                    StreamPart part;
                    if (part.Read(fetch, false) != StreamPart::kRead) return PassReport{false, 0};
                    return PassReport{true, part.Body()[0] - '0'};
                  });
    return recorder.Reports();
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  FakeClock clock_;
};

TEST_F(StreamLoopTest, UnpacedLoopReportsEachPartAndNeverSleeps) {
  StreamLoopShape shape;
  shape.clock = &clock_;
  EXPECT_EQ(RunThreePasses(shape),
            (std::vector<Report>{{true, 1}, {true, 2}, {true, 3}, {false, 0}}));
  EXPECT_TRUE(clock_.sleeps.empty());
  EXPECT_EQ(cam_.Count(kPath), 1) << "one stream for the whole loop";
}

TEST_F(StreamLoopTest, PacedLoopWaitsOutThePeriodAfterEachPass) {
  StreamLoopShape shape;
  shape.period = kOneSecond;
  shape.clock = &clock_;
  EXPECT_EQ(RunThreePasses(shape),
            (std::vector<Report>{{true, 1}, {true, 2}, {true, 3}, {false, 0}}));
  EXPECT_EQ(clock_.sleeps, (std::vector<DelayTimer::TimePoint::duration>{
                               std::chrono::seconds(1), std::chrono::seconds(2),
                               std::chrono::seconds(3)}));
}

}  // namespace
