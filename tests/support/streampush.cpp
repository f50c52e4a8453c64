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
      const bool written = push.raw ? writer.Raw(push.parts[i])
                                    : writer.Part(push.content_type, push.parts[i]);
      if (!written) return;
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
               (push.raw ? writer.Raw(push.parts.back())
                         : writer.Part(push.content_type, push.parts.back()))) {
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

FakeCamera::Handler OutageHandler(std::vector<std::string> before, std::string after, bool raw) {
  Push first{std::move(before), Push::kClose};
  Push refused{{}, Push::kClose, {}, "text/plain", 503};
  Push again{{std::move(after)}, Push::kRepeatLast, std::chrono::milliseconds(5)};
  first.raw = again.raw = raw;
  return PushHandler({first, refused, again});
}

::testing::AssertionResult FollowedAcrossOutage(const std::vector<Report>& reports, Report first,
                                                Report back) {
  if (reports.empty() || !(reports[0] == first)) {
    return ::testing::AssertionFailure() << "the first report is not the first part's";
  }
  size_t at = 1;
  while (at < reports.size() && reports[at] == (Report{false, 0})) ++at;
  if (at == 1) return ::testing::AssertionFailure() << "no (false, 0) while the camera was away";
  if (at == reports.size() || !(reports[at] == back)) {
    return ::testing::AssertionFailure() << "after the outage the report is not the new part's";
  }
  return ::testing::AssertionSuccess();
}

std::string RawPart(const std::string& body, const std::vector<std::string>& headers,
                    const std::string& trailer, const std::string& content_type) {
  std::string part = "--myboundary\r\nContent-Type: " + content_type +
                     "\r\nContent-Length: " + std::to_string(body.size()) + "\r\n";
  for (const std::string& h : headers) part += h + "\r\n";
  return part + "\r\n" + body + "\r\n" + trailer;
}

void PrintTo(const InputReading& reading, std::ostream* os) {
  *os << "{result " << reading.result << ", " << (reading.active ? "active" : "idle") << "}";
}

void PrintTo(const MotionReading& reading, std::ostream* os) {
  *os << "{result " << reading.result << ", " << (reading.motion ? "motion" : "no motion")
      << ", level " << reading.level << "}";
}

}  // namespace evtest
