// Latency of the event-stream detectors: from the moment the camera writes a part to the
// moment the detector's report of it reaches the event buffer (taken by an EventBuf
// observer), over loopback, for AxisMD (every part judged) and HikVisionMD (every fourth part
// judged; only those parts are timed, the three between them are written unmeasured). The
// camera writes a timed part only after the previous report has come and a short pause, so
// each sample is one part's way through an idle detector. Prints p50, p99 and max of
// 10,000 timed parts per detector.

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "detectors/axis.h"
#include "detectors/hikvision.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "sim/net/httpserver.h"

namespace {

using Clock = std::chrono::steady_clock;

const int kTimedParts = 10000;
const int kWarmUp = 200;
const auto kPause = std::chrono::microseconds(200);
const char kBoundary[] = "benchboundary";

// Reports seen by the observer, and when the last one came.
class ReportClock {
 public:
  explicit ReportClock(EventBuf& buffer) : buffer_(buffer) {
    handle_ = buffer.AddObserver([this](const StatusReport&) {
      const Clock::time_point now = Clock::now();
      std::lock_guard<std::mutex> lock(mutex_);
      ++count_;
      last_ = now;
      cv_.notify_all();
    });
  }
  ~ReportClock() { buffer_.RemoveObserver(handle_); }

  uint64_t Count() {
    std::lock_guard<std::mutex> lock(mutex_);
    return count_;
  }
  // Waits for a report beyond `seen`; its time, or nothing after 10 s.
  bool WaitBeyond(uint64_t seen, Clock::time_point* when) {
    std::unique_lock<std::mutex> lock(mutex_);
    if (!cv_.wait_for(lock, std::chrono::seconds(10), [&] { return count_ > seen; })) return false;
    *when = last_;
    return true;
  }

 private:
  EventBuf& buffer_;
  int handle_;
  std::mutex mutex_;
  std::condition_variable cv_;
  uint64_t count_ = 0;      // guarded by mutex_
  Clock::time_point last_;  // guarded by mutex_
};

std::string Part(const std::string& type, const std::string& body) {
  return std::string("--") + kBoundary + "\r\nContent-Type: " + type +
         "\r\nContent-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body + "\r\n";
}

std::string Alert(const std::string& type, const std::string& state, long count) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\r\n"
         "<EventNotificationAlert version=\"1.0\" "
         "xmlns=\"http://www.hikvision.com/ver10/XMLSchema\">\r\n"
         "<ipAddress>127.0.0.1</ipAddress>\r\n<portNo>80</portNo>\r\n<protocol>HTTP</protocol>\r\n"
         "<macAddress>44:19:b6:5a:00:01</macAddress>\r\n<channelID>1</channelID>\r\n"
         "<dateTime>2024-05-01T10:00:00+08:00</dateTime>\r\n"
         "<activePostCount>" +
         std::to_string(count) +
         "</activePostCount>\r\n"
         "<eventType>" +
         type + "</eventType>\r\n<eventState>" + state +
         "</eventState>\r\n"
         "<eventDescription>alarm</eventDescription>\r\n</EventNotificationAlert>\r\n";
}

struct Plan {
  // The part judged on timed pass `n` (from 0).
  std::function<std::string(long n)> judged;
  // Parts written, unmeasured, before each judged part (and once before the first).
  std::function<std::vector<std::string>(long n)> between;
};

// Serves one stream per the plan and times every judged part from its write to its report.
class TimedCamera {
 public:
  TimedCamera(Plan plan, ReportClock& clock)
      : plan_(std::move(plan)),
        clock_(clock),
        server_([this](evsim::HttpConnection& c) { Serve(c); }) {}

  int Port() const { return server_.Port(); }
  // Blocks until every timed part has been written and reported (or a report went missing).
  std::vector<double> Samples() {
    std::unique_lock<std::mutex> lock(mutex_);
    done_cv_.wait(lock, [this] { return done_; });
    return samples_;
  }

 private:
  void Serve(evsim::HttpConnection& c) {
    const std::string head =
        std::string("HTTP/1.1 200 OK\r\nContent-Type: multipart/x-mixed-replace;boundary=") +
        kBoundary + "\r\nConnection: close\r\n\r\n";
    std::vector<double> samples;
    bool ok = c.Write(head);
    for (long n = 0; ok && n < kWarmUp + kTimedParts; ++n) {
      for (const std::string& part : plan_.between(n)) ok = ok && c.Write(part);
      std::this_thread::sleep_for(kPause);
      const std::string part = plan_.judged(n);
      const uint64_t seen = clock_.Count();
      const Clock::time_point written = Clock::now();
      Clock::time_point reported;
      ok = ok && c.Write(part) && clock_.WaitBeyond(seen, &reported);
      if (ok && n >= kWarmUp) {
        samples.push_back(std::chrono::duration<double, std::micro>(reported - written).count());
      }
    }
    std::lock_guard<std::mutex> lock(mutex_);
    if (!done_) {
      samples_ = std::move(samples);
      done_ = true;
      done_cv_.notify_all();
    }
    // Hold the stream until the detector goes, so that it sees no failure meanwhile.
    while (!c.PeerClosed() && c.SleepFor(std::chrono::milliseconds(10))) {
    }
  }

  const Plan plan_;
  ReportClock& clock_;
  std::mutex mutex_;
  std::condition_variable done_cv_;
  bool done_ = false;            // guarded by mutex_
  std::vector<double> samples_;  // guarded by mutex_
  evsim::HttpServer server_;     // last: stops before the rest goes away
};

double Percentile(std::vector<double> v, double p) {
  std::sort(v.begin(), v.end());
  const size_t i = static_cast<size_t>(p * static_cast<double>(v.size() - 1) + 0.5);
  return v[std::min(i, v.size() - 1)];
}

void PrintRow(const char* name, const std::vector<double>& s) {
  if (s.size() < static_cast<size_t>(kTimedParts)) {
    std::printf("%-12s  only %zu of %d parts were reported\n", name, s.size(), kTimedParts);
    return;
  }
  std::printf("%-12s  %8zu  %9.1f  %9.1f  %9.1f\n", name, s.size(), Percentile(s, 0.50),
              Percentile(s, 0.99), *std::max_element(s.begin(), s.end()));
}

template <class Detector>
std::vector<double> Measure(Plan plan,
                            const std::function<std::unique_ptr<Detector>(int port)>& make) {
  EventBuf buffer;
  ReportClock clock(buffer);
  TimedCamera camera(std::move(plan), clock);
  std::unique_ptr<Detector> detector = make(camera.Port());
  detector->Init(&buffer, 500);
  detector->Start();
  std::vector<double> samples = camera.Samples();
  detector->Stop();
  return samples;
}

}  // namespace

int main() {
  const std::string axis_path = "/axis-cgi/motion/motiondata.cgi";
  CameraRecord record;
  record.host = "127.0.0.1";

  Plan axis_plan{[](long n) {
                   return Part("text/plain",
                               "group=0;level=" + std::to_string(n % 2 ? 60 : 70) +
                                   ";threshold=50;\r\ngroup=1;level=0;threshold=50;\r\n");
                 },
                 [](long) { return std::vector<std::string>{}; }};
  std::unique_ptr<Camera> axis_camera;
  std::unique_ptr<CameraAPI> axis_api;
  std::vector<double> axis = Measure<AxisMD>(axis_plan, [&](int port) {
    record.port = port;
    axis_camera = std::make_unique<Camera>(record);
    CameraAPIRecord api;
    api.stream = StreamLocation{axis_path, port};
    axis_api = std::make_unique<CameraAPI>(api);
    return std::make_unique<AxisMD>(axis_camera.get(), axis_api.get());
  });

  // Pass p is judged when p % 4 == 1: one heartbeat first, then judged part, three heartbeats.
  const std::string heartbeat = Part("application/xml", Alert("videoloss", "inactive", 0));
  Plan hik_plan{[](long n) { return Part("application/xml", Alert("VMD", "active", n + 1)); },
                [heartbeat](long n) {
                  return n == 0 ? std::vector<std::string>{heartbeat}
                                : std::vector<std::string>{heartbeat, heartbeat, heartbeat};
                }};
  std::unique_ptr<Camera> hik_camera;
  std::vector<double> hik = Measure<HikVisionMD>(hik_plan, [&](int port) {
    record.port = port;
    hik_camera = std::make_unique<Camera>(record);
    return std::make_unique<HikVisionMD>(hik_camera.get());
  });

  std::printf("Part written -> report in the EventBuf, loopback, microseconds\n");
  std::printf("%-12s  %8s  %9s  %9s  %9s\n", "detector", "parts", "p50", "p99", "max");
  PrintRow("AxisMD", axis);
  PrintRow("HikVisionMD", hik);
  return axis.size() == static_cast<size_t>(kTimedParts) &&
                 hik.size() == static_cast<size_t>(kTimedParts)
             ? 0
             : 1;
}
