#include "sim/makers/alertstream.h"

#include <time.h>

#include <vector>

#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

// Records of one kind in a row.
constexpr int kRun = 4;

struct Record {
  std::string type;  // eventType
  bool active;       // eventState
  int post_count;    // activePostCount
  int input;         // inputIOPortID, 0 for none
  std::string description;
};

std::string Now() {
  char text[32];
  const time_t now = time(nullptr);
  struct tm parts;
  gmtime_r(&now, &parts);
  strftime(text, sizeof(text), "%Y-%m-%dT%H:%M:%SZ", &parts);
  return text;
}

// The host name the client asked for, without its port; 127.0.0.1 when it is missing or
// holds anything that would not stand as it is in a record.
std::string HostOf(const HttpRequest& request) {
  std::string host = request.Header("Host");
  const size_t colon = host.rfind(':');
  if (colon != std::string::npos && host.find(']') == std::string::npos) host.resize(colon);
  for (char c : host) {
    const bool plain = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                       c == '.' || c == '-' || c == ':' || c == '[' || c == ']';
    if (!plain) return "127.0.0.1";
  }
  return host.empty() ? "127.0.0.1" : host;
}

std::string RecordXml(const Record& r, const AlertStreamStyle& style, const std::string& host) {
  std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\r\n"
      "<EventNotificationAlert version=\"1.0\" xmlns=\"" +
      style.xml_namespace +
      "\">\r\n"
      "<ipAddress>" +
      host +
      "</ipAddress>\r\n"
      "<protocol>HTTP</protocol>\r\n"
      "<macAddress>" +
      style.mac +
      "</macAddress>\r\n"
      "<channelID>1</channelID>\r\n"
      "<dateTime>" +
      Now() +
      "</dateTime>\r\n"
      "<activePostCount>" +
      std::to_string(r.post_count) +
      "</activePostCount>\r\n"
      "<eventType>" +
      r.type +
      "</eventType>\r\n"
      "<eventState>" +
      (r.active ? "active" : "inactive") + "</eventState>\r\n";
  if (r.input > 0) xml += "<inputIOPortID>" + std::to_string(r.input) + "</inputIOPortID>\r\n";
  xml += "<eventDescription>" + r.description +
         "</eventDescription>\r\n"
         "</EventNotificationAlert>\r\n";
  return xml;
}

// The stream of one connection: which record comes next and the motion post count.
class AlertCycle {
 public:
  Record Next(const CameraStatus& status) {
    const int slot = position_;
    position_ = (position_ + 1) % (2 * kRun + 1);
    if (slot < kRun) {
      if (status.motion > 0) ++motion_posts_;
      return Record{"VMD", status.motion > 0, motion_posts_, 0, "Motion alarm"};
    }
    if (slot < 2 * kRun) return InputRecord(status, slot - kRun);
    return Record{"videoloss", false, 0, 0, "videoloss alarm"};
  }

 private:
  Record InputRecord(const CameraStatus& status, int index) {
    std::vector<int> active;
    for (int n = 1; n <= kInputCount; ++n) {
      if (status.Input(n)) active.push_back(n);
    }
    if (active.empty()) return Record{"IO", false, 0, index + 1, "IO alarm"};
    ++input_posts_;
    return Record{"IO", true, input_posts_, active[static_cast<size_t>(index) % active.size()],
                  "IO alarm"};
  }

  int position_ = 0;      // slot of the next record in the cycle
  int motion_posts_ = 0;  // VMD records sent while motion was on
  int input_posts_ = 0;   // IO records sent while an input was active
};

}  // namespace

void ServeAlertStream(HttpConnection& connection, const CameraState& state,
                      const AlertStreamStyle& style) {
  const std::string host = HostOf(connection.Request());
  AlertCycle cycle;
  ServeMultipart(connection, "application/xml; charset=\"UTF-8\"", style.period,
                 [&]() -> std::string {
                   const CameraStatus status = state.Get();
                   if (status.silent) return "";
                   return RecordXml(cycle.Next(status), style, host);
                 });
}

}  // namespace evsim
