// A tiny host built against the installed library: one CanonMD detector on a camera record
// whose port nothing listens on. It must fail its direct poll, report failed readings
// (false, 0) from its worker thread, and report (false, 0) last after Stop.
// Prints what it saw; exits 0 only when every check holds.

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <mutex>
#include <vector>

#include "detectors/canon.h"
#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"

namespace {

int failures = 0;

void Check(bool ok, const char* what) {
  std::printf("%s: %s\n", ok ? "ok" : "FAILED", what);
  if (!ok) ++failures;
}

// A loopback port that nothing listens on: bound by us, then released.
int ClosedPort() {
  int fd = socket(AF_INET, SOCK_STREAM, 0);
  if (fd < 0) return -1;
  sockaddr_in addr{};
  addr.sin_family = AF_INET;
  addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  addr.sin_port = 0;
  socklen_t len = sizeof(addr);
  int port = -1;
  if (bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) == 0 &&
      getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &len) == 0) {
    port = ntohs(addr.sin_port);
  }
  close(fd);
  return port;
}

}  // namespace

int main() {
  int port = ClosedPort();
  Check(port > 0, "found a closed loopback port");
  if (port <= 0) return 1;

  CameraRecord record;
  record.host = "127.0.0.1";
  record.port = port;
  Camera camera(record);
  CanonMD detector(&camera);

  bool state = true;
  unsigned int level = 7;
  Check(detector.DoMD(state, level) == -1, "a poll of a closed port fails (-1)");
  Check(!state && level == 0, "a failed poll reads (false, 0)");

  EventBuf buffer;
  std::mutex mutex;
  std::condition_variable changed;
  std::vector<StatusReport> reports;
  buffer.AddObserver([&](const StatusReport& report) {
    std::lock_guard<std::mutex> lock(mutex);
    reports.push_back(report);
    changed.notify_all();
  });

  Check(detector.Init(&buffer, 100) == 0, "Init");
  Check(detector.Start() == 0, "Start");
  Check(detector.IsStarted(), "started");
  {
    // A refused connection fails at once; the bound only keeps a broken build from hanging.
    std::unique_lock<std::mutex> lock(mutex);
    changed.wait_for(lock, std::chrono::seconds(60), [&] { return !reports.empty(); });
  }
  Check(detector.Stop() == 0, "Stop");
  Check(!detector.IsStarted(), "stopped");

  std::lock_guard<std::mutex> lock(mutex);
  std::printf("reports: %zu\n", reports.size());
  Check(reports.size() >= 2, "at least one reading and the final report");
  bool all_failed = true;
  for (const StatusReport& r : reports) all_failed = all_failed && !r.state && r.value == 0;
  Check(all_failed, "every report is (false, 0): the camera never answered");
  Check(buffer.Count() == reports.size(), "the buffer counted every report");
  StatusReport last = buffer.Last();
  Check(!last.state && last.value == 0, "the last report is (false, 0)");

  std::printf("%s\n", failures == 0 ? "host: all checks passed" : "host: checks FAILED");
  return failures == 0 ? 0 : 1;
}
