// Latency from a change of a simulated camera's state to the detector's report of it, over
// loopback, for OnvifMD (pull-point long poll) beside HikVisionMD (alert stream), both
// against camsim's emulations of those cameras. Each sample flips the motion state once the
// detector has reported the previous one and a pause of 20 to 120 ms (so that the flip
// comes while the detector waits, at no fixed phase of the emulation's pace), and times the
// flip to the first report of the new state. Includes each emulation's own pace (the alert stream writes a record every 50 ms;
// the simulated event service looks at the state every 20 ms). Prints p50, p99 and max.

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <memory>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

#include "detectors/hikvision.h"
#include "detectors/onvif.h"
#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "sim/camstate.h"
#include "sim/emulation.h"
#include "sim/net/httpserver.h"

namespace {

using Clock = std::chrono::steady_clock;

const int kSamples = 100;

// The state of the latest report, and when it changed.
class StateClock {
 public:
  explicit StateClock(EventBuf& buffer) : buffer_(buffer) {
    handle_ = buffer.AddObserver([this](const StatusReport& r) {
      const Clock::time_point now = Clock::now();
      std::lock_guard<std::mutex> lock(mutex_);
      if (!seen_ || r.state != state_) {
        seen_ = true;
        state_ = r.state;
        changed_ = now;
        cv_.notify_all();
      }
    });
  }
  ~StateClock() { buffer_.RemoveObserver(handle_); }

  // Waits until the reported state is `state`; when it became so, or false after 10 s.
  bool WaitFor(bool state, Clock::time_point* when) {
    std::unique_lock<std::mutex> lock(mutex_);
    if (!cv_.wait_for(lock, std::chrono::seconds(10), [&] { return seen_ && state_ == state; })) {
      return false;
    }
    *when = changed_;
    return true;
  }

 private:
  EventBuf& buffer_;
  int handle_;
  std::mutex mutex_;
  std::condition_variable cv_;
  bool seen_ = false;           // guarded by mutex_
  bool state_ = false;          // guarded by mutex_
  Clock::time_point changed_;   // guarded by mutex_
};

template <class Detector>
std::vector<double> Measure(const char* key) {
  const evsim::Emulation* e = evsim::FindEmulation(key);
  evsim::CameraState state;
  evsim::HttpServer server([e, &state](evsim::HttpConnection& c) {
    if (e->handle_with_login) {
      e->handle_with_login(c, state, evsim::Login{});
    } else {
      e->handle(c, state);
    }
  });
  CameraRecord record;
  record.host = "127.0.0.1";
  record.port = server.Port();
  Camera camera(record);
  EventBuf buffer;
  StateClock clock(buffer);
  Detector detector(&camera);
  detector.Init(&buffer, 500);
  detector.Start();
  std::vector<double> samples;
  Clock::time_point when;
  bool ok = clock.WaitFor(false, &when);
  std::mt19937 random(22);
  std::uniform_int_distribution<int> pause(20, 120);
  for (int n = 0; ok && n < kSamples; ++n) {
    const bool motion = n % 2 == 0;
    std::this_thread::sleep_for(std::chrono::milliseconds(pause(random)));
    const Clock::time_point set = Clock::now();
    state.SetMotion(motion ? 60 : 0);
    ok = clock.WaitFor(motion, &when);
    if (ok) samples.push_back(std::chrono::duration<double, std::milli>(when - set).count());
  }
  detector.Stop();
  server.Stop();
  return samples;
}

double Percentile(std::vector<double> v, double p) {
  std::sort(v.begin(), v.end());
  const size_t i = static_cast<size_t>(p * static_cast<double>(v.size() - 1) + 0.5);
  return v[std::min(i, v.size() - 1)];
}

void PrintRow(const char* name, const std::vector<double>& s) {
  if (s.size() < static_cast<size_t>(kSamples)) {
    std::printf("%-12s  only %zu of %d changes were reported\n", name, s.size(), kSamples);
    return;
  }
  std::printf("%-12s  %8zu  %9.1f  %9.1f  %9.1f\n", name, s.size(), Percentile(s, 0.50),
              Percentile(s, 0.99), *std::max_element(s.begin(), s.end()));
}

}  // namespace

int main() {
  std::vector<double> onvif = Measure<OnvifMD>("onvif");
  std::vector<double> hik = Measure<HikVisionMD>("hikvision");
  std::printf("Camera state set -> report of the new state, loopback, milliseconds\n");
  std::printf("%-12s  %8s  %9s  %9s  %9s\n", "detector", "changes", "p50", "p99", "max");
  PrintRow("OnvifMD", onvif);
  PrintRow("HikVisionMD", hik);
  return onvif.size() == static_cast<size_t>(kSamples) && hik.size() == static_cast<size_t>(kSamples)
             ? 0
             : 1;
}
