#include "tests/support/streampush.h"

#include <algorithm>
#include <atomic>
#include <ostream>

namespace evtest {

FakeCamera::Handler PushHandler(std::vector<Push> pushes) {
  auto connections = std::make_shared<std::atomic<size_t>>(0);
  return [pushes = std::move(pushes), connections](evsim::HttpConnection& connection) {
    const size_t n = connections->fetch_add(1);
    const Push& push = pushes[std::min(n, pushes.size() - 1)];
    if (push.status != 200) {
      connection.Write(evsim::MakeResponse(push.status, "text/plain", "unavailable\r\n"));
      return;
    }
    MultipartWriter writer(connection);
    if (!writer.Begin()) return;
    for (size_t i = 0; i < push.parts.size(); ++i) {
      if (i > 0 && push.gap.count() > 0 && !connection.SleepFor(push.gap)) return;
      if (!writer.Part(push.content_type, push.parts[i])) return;
    }
    switch (push.end) {
      case Push::kClose:
        return;
      case Push::kHold:
        while (!connection.PeerClosed() && connection.SleepFor(std::chrono::milliseconds(10))) {
        }
        return;
      case Push::kRepeatLast: {
        const auto gap = std::max(push.gap, std::chrono::milliseconds(2));
        while (!push.parts.empty() && connection.SleepFor(gap) &&
               writer.Part(push.content_type, push.parts.back())) {
        }
        return;
      }
    }
  };
}

std::unique_ptr<MultipartFetch> FetchFrom(const FakeCamera& camera, const std::string& target,
                                          const std::string& user, const std::string& password) {
  return std::make_unique<MultipartFetch>("127.0.0.1", camera.Port(), target.c_str(), user.c_str(),
                                          password.c_str(), 10);
}

void PrintTo(const MotionReading& reading, std::ostream* os) {
  *os << "{result " << reading.result << ", " << (reading.motion ? "motion" : "no motion")
      << ", level " << reading.level << "}";
}

}  // namespace evtest
