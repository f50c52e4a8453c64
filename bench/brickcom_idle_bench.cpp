// What one BrickcomEID with an input count of 0 costs. Such a detector asks nothing and has
// no pacing timer: its thread reports (false, 1) back to back for as long as it runs.
//
// BM_ZeroInputsPass: one pass on the calling thread (DoEID and its SetStatus), CPU time.
// BM_ZeroInputsDetector: the detector started for one second per iteration; the process's
// CPU time over that second (the benchmark's own thread sleeps meanwhile) gives the share of
// one core, and the event buffer's count gives the passes. `observer` 1 adds one observer
// to the buffer that keeps the last reading, as a host that watches the buffer does.
//
// BM_RefusedCameraDetector: for comparison, a detector with one input whose camera refuses
// every connection at once (a closed loopback port): its passes are paced only by the failed
// connection attempts.

#include <benchmark/benchmark.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <time.h>
#include <unistd.h>

#include <chrono>
#include <functional>
#include <memory>
#include <thread>

#include "detectors/brickcom.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/polledloop.h"

namespace {

double ProcessCpuSeconds() {
  timespec ts;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + static_cast<double>(ts.tv_nsec) * 1e-9;
}

// Never asked: with no inputs the detector sends nothing.
Camera& UnaskedCamera() {
  static Camera camera([] {
    CameraRecord r;
    r.host = "127.0.0.1";
    r.port = 9;
    return r;
  }());
  return camera;
}

// A loopback port that nothing listens on: bound, read and closed again.
int ClosedPort() {
  const int fd = socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in addr{};
  addr.sin_family = AF_INET;
  addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t length = sizeof(addr);
  int port = 0;
  if (bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) == 0 &&
      getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &length) == 0) {
    port = ntohs(addr.sin_port);
  }
  close(fd);
  return port;
}

// Runs detector for one second per iteration and sets the counters from the process's CPU
// time and the buffer's count of reports.
void RunForOneSecond(benchmark::State& state, EventBuf& buffer, const std::function<std::unique_ptr<BrickcomEID>()>& make) {
  double cpu = 0, wall = 0;
  uint64_t passes = 0;
  for (auto _ : state) {
    std::unique_ptr<BrickcomEID> detector = make();
    detector->Init(&buffer, 500);
    const uint64_t count0 = buffer.Count();
    const double cpu0 = ProcessCpuSeconds();
    const auto wall0 = std::chrono::steady_clock::now();
    detector->Start();
    std::this_thread::sleep_for(std::chrono::seconds(1));
    detector->Stop();
    wall += std::chrono::duration<double>(std::chrono::steady_clock::now() - wall0).count();
    cpu += ProcessCpuSeconds() - cpu0;
    passes += buffer.Count() - count0 - 1;  // less the final (false, 0)
  }
  if (passes == 0) {
    state.SkipWithError("the detector made no pass");
    return;
  }
  state.counters["passes_per_s"] = static_cast<double>(passes) / wall;
  state.counters["core_share"] = cpu / wall;
  state.counters["cpu_ns_per_pass"] = cpu * 1e9 / static_cast<double>(passes);
}

void BM_ZeroInputsPass(benchmark::State& state) {
  CameraAPI api(CameraAPIRecord{});
  BrickcomEID detector(&UnaskedCamera(), &api, 0);
  EventBuf buffer;
  for (auto _ : state) {
    bool active = true;
    const int result = detector.DoEID(active);
    const PassReport report = InputReport(result, active);
    buffer.SetStatus(report.state, report.value);
  }
  if (buffer.Last().value != 1 || buffer.Last().state) state.SkipWithError("a pass did not read idle");
}

void BM_ZeroInputsDetector(benchmark::State& state) {
  CameraAPI api(CameraAPIRecord{});
  EventBuf buffer;
  bool last_state = true;
  if (state.range(0) == 1) {
    buffer.AddObserver([&last_state](const StatusReport& r) { last_state = r.state; });
  }
  RunForOneSecond(state, buffer, [&api] { return std::make_unique<BrickcomEID>(&UnaskedCamera(), &api, 0); });
}

void BM_RefusedCameraDetector(benchmark::State& state) {
  CameraRecord record;
  record.host = "127.0.0.1";
  record.port = ClosedPort();
  Camera camera(record);
  CameraAPI api(CameraAPIRecord{});
  EventBuf buffer;
  RunForOneSecond(state, buffer, [&] { return std::make_unique<BrickcomEID>(&camera, &api, 1); });
  if (buffer.Last().value != 0) state.SkipWithError("a pass against a closed port succeeded");
}

BENCHMARK(BM_ZeroInputsPass)->MinTime(1.0);
BENCHMARK(BM_ZeroInputsDetector)->Arg(0)->Arg(1)->Iterations(3)->UseRealTime()->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RefusedCameraDetector)->Iterations(3)->UseRealTime()->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
