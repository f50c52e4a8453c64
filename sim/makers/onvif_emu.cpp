#include "sim/makers/onvif_emu.h"

#include <libxml/parser.h>
#include <libxml/tree.h>
#include <openssl/evp.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kEnvelopeOpen[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>"
    "<s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\" "
    "xmlns:tt=\"http://www.onvif.org/ver10/schema\" "
    "xmlns:tds=\"http://www.onvif.org/ver10/device/wsdl\" "
    "xmlns:tev=\"http://www.onvif.org/ver10/events/wsdl\" "
    "xmlns:wsnt=\"http://docs.oasis-open.org/wsn/b-2\" "
    "xmlns:wsa=\"http://www.w3.org/2005/08/addressing\" "
    "xmlns:tns1=\"http://www.onvif.org/ver10/topics\" "
    "xmlns:ter=\"http://www.onvif.org/ver10/error\"><s:Body>";
constexpr char kEnvelopeClose[] = "</s:Body></s:Envelope>";
// The same namespaces under other names; the topic namespace is declared per message.
constexpr char kOddEnvelopeOpen[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>"
    "<e:Envelope xmlns:e=\"http://www.w3.org/2003/05/soap-envelope\" "
    "xmlns:sc=\"http://www.onvif.org/ver10/schema\" "
    "xmlns:ev=\"http://www.onvif.org/ver10/events/wsdl\" "
    "xmlns:n=\"http://docs.oasis-open.org/wsn/b-2\" "
    "xmlns:tns1=\"http://example.com/not/the/topics\"><e:Body>";
constexpr char kOddEnvelopeClose[] = "</e:Body></e:Envelope>";

// A parsed request, searched by local name: clients choose their prefixes freely.
struct Request {
  xmlDocPtr doc = nullptr;
  explicit Request(const std::string& body) {
    static const bool initialized = [] {
      xmlInitParser();  // its global set-up is not thread-safe
      return true;
    }();
    (void)initialized;
    doc = xmlReadMemory(body.data(), static_cast<int>(body.size()), "request.xml", nullptr,
                        XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING);
  }
  ~Request() {
    if (doc) xmlFreeDoc(doc);
  }
  Request(const Request&) = delete;
  Request& operator=(const Request&) = delete;

  static xmlNodePtr FindIn(xmlNodePtr node, const char* name) {
    for (; node; node = node->next) {
      if (node->type != XML_ELEMENT_NODE) continue;
      if (std::strcmp(reinterpret_cast<const char*>(node->name), name) == 0) return node;
      if (xmlNodePtr found = FindIn(node->children, name)) return found;
    }
    return nullptr;
  }
  xmlNodePtr Find(const char* name) const { return doc ? FindIn(xmlDocGetRootElement(doc), name) : nullptr; }
  std::string Text(const char* name) const {
    xmlNodePtr node = Find(name);
    if (!node) return "";
    xmlChar* content = xmlNodeGetContent(node);
    std::string out = content ? reinterpret_cast<const char*>(content) : "";
    xmlFree(content);
    size_t begin = out.find_first_not_of(" \t\r\n");
    size_t end = out.find_last_not_of(" \t\r\n");
    return begin == std::string::npos ? "" : out.substr(begin, end - begin + 1);
  }
  // The local name of the Body's first element: the operation.
  std::string Operation() const {
    xmlNodePtr body = Find("Body");
    if (!body) return "";
    for (xmlNodePtr c = body->children; c; c = c->next) {
      if (c->type == XML_ELEMENT_NODE) return reinterpret_cast<const char*>(c->name);
    }
    return "";
  }
};

// "PT5S", "PT1M" -> seconds; fallback when it is neither.
int Seconds(const std::string& duration, int fallback) {
  int n = 0;
  char unit = 0;
  if (std::sscanf(duration.c_str(), "PT%d%c", &n, &unit) == 2 && n >= 0) {
    if (unit == 'S') return n;
    if (unit == 'M') return n * 60;
    if (unit == 'H') return n * 3600;
  }
  return fallback;
}

std::string UtcText(time_t t) {
  struct tm tm_utc;
  gmtime_r(&t, &tm_utc);
  char text[32];
  std::strftime(text, sizeof(text), "%Y-%m-%dT%H:%M:%SZ", &tm_utc);
  return text;
}

std::string DecodeBase64(const std::string& text) {
  std::string out(text.size(), '\0');
  int n = EVP_DecodeBlock(reinterpret_cast<unsigned char*>(&out[0]),
                          reinterpret_cast<const unsigned char*>(text.data()),
                          static_cast<int>(text.size()));
  if (n < 0) return "";
  size_t size = static_cast<size_t>(n);
  // EVP_DecodeBlock counts the padding as data.
  if (text.size() >= 1 && text[text.size() - 1] == '=') --size;
  if (text.size() >= 2 && text[text.size() - 2] == '=') --size;
  out.resize(size);
  return out;
}

std::string EncodeBase64(const unsigned char* data, size_t size) {
  std::string out(4 * ((size + 2) / 3) + 1, '\0');
  int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&out[0]), data, static_cast<int>(size));
  out.resize(n > 0 ? static_cast<size_t>(n) : 0);
  return out;
}

std::string Fault(const std::string& code, const std::string& subcode, const std::string& text) {
  return std::string(kEnvelopeOpen) + "<s:Fault><s:Code><s:Value>" + code +
         "</s:Value><s:Subcode><s:Value>" + subcode + "</s:Value></s:Subcode></s:Code>"
         "<s:Reason><s:Text xml:lang=\"en\">" + text + "</s:Text></s:Reason></s:Fault>" +
         kEnvelopeClose;
}

void Answer(HttpConnection& connection, const std::string& body, int status = 200) {
  connection.Write(MakeResponse(status, "application/soap+xml; charset=utf-8", body));
}

}  // namespace

OnvifDevice::OnvifDevice(OnvifDeviceOptions options, CameraState* state)
    : options_(std::move(options)), state_(state) {}

std::string OnvifDevice::Time() const {
  return UtcText(std::time(nullptr) + static_cast<time_t>(options_.clock_offset));
}

bool OnvifDevice::TokenValid(const std::string& body) const {
  if (options_.user.empty()) return true;
  Request request(body);
  std::string user = request.Text("Username");
  std::string digest = request.Text("Password");
  std::string nonce = DecodeBase64(request.Text("Nonce"));
  std::string created = request.Text("Created");
  if (user != options_.user || nonce.empty() || created.empty()) return false;
  struct tm tm_utc = {};
  if (std::sscanf(created.c_str(), "%4d-%2d-%2dT%2d:%2d:%2d", &tm_utc.tm_year, &tm_utc.tm_mon,
                  &tm_utc.tm_mday, &tm_utc.tm_hour, &tm_utc.tm_min, &tm_utc.tm_sec) != 6) {
    return false;
  }
  tm_utc.tm_year -= 1900;
  tm_utc.tm_mon -= 1;
  // Like a real device, refuse a token created far from the device's own time.
  long skew = static_cast<long>(timegm(&tm_utc)) -
              static_cast<long>(std::time(nullptr) + options_.clock_offset);
  if (skew > 300 || skew < -300) return false;
  std::string material = nonce + created + options_.password;
  unsigned char sha[EVP_MAX_MD_SIZE];
  unsigned int size = 0;
  EVP_Digest(material.data(), material.size(), sha, &size, EVP_sha1(), nullptr);
  return EncodeBase64(sha, size) == digest;
}

std::vector<std::pair<std::string, bool>> OnvifDevice::Properties() const {
  CameraStatus status = state_->Get();
  std::vector<std::pair<std::string, bool>> out;
  if (options_.cell_motion) out.push_back({"cell", status.motion > 0});
  if (options_.cell_motion && options_.second_source) out.push_back({"cell2", status.motion == 0});
  if (options_.motion_alarm) out.push_back({"alarm", status.motion > 0});
  if (options_.motion_alarm && options_.second_source) out.push_back({"alarm2", status.motion == 0});
  for (int n = 1; n <= options_.inputs && n <= kInputCount; ++n) {
    out.push_back({"input" + std::to_string(n), status.Input(n)});
  }
  return out;
}

std::string OnvifDevice::Notification(const std::string& property, bool state,
                                      bool initialized) const {
  std::string topic, source, data;
  std::string value = state ? "true" : "false";
  const std::string number = property.back() == '2' ? "2" : "1";
  if (property.compare(0, 4, "cell") == 0) {
    topic = "RuleEngine/CellMotionDetector/Motion";
    source = "VideoSourceConfigurationToken\" Value=\"VideoSourceConfig_" + number;
    data = "IsMotion";
  } else if (property.compare(0, 5, "alarm") == 0) {
    topic = "VideoSource/MotionAlarm";
    source = "Source\" Value=\"VideoSource_" + number;
    data = "State";
  } else {
    topic = "Device/Trigger/DigitalInput";
    source = "InputToken\" Value=\"DigitalInput_" + property.substr(5);
    data = "LogicalState";
  }
  std::string operation = initialized ? "Initialized" : "Changed";
  if (!options_.unusual_prefixes) {
    return "<wsnt:NotificationMessage><wsnt:Topic Dialect=\"http://www.onvif.org/ver10/tev/"
           "topicExpression/ConcreteSet\">tns1:" + topic + "</wsnt:Topic><wsnt:Message>"
           "<tt:Message UtcTime=\"" + Time() + "\" PropertyOperation=\"" + operation +
           "\"><tt:Source><tt:SimpleItem Name=\"" + source + "\"/></tt:Source><tt:Data>"
           "<tt:SimpleItem Name=\"" + data + "\" Value=\"" + value + "\"/></tt:Data>"
           "</tt:Message></wsnt:Message></wsnt:NotificationMessage>";
  }
  // The topic's prefix is declared on the topic element alone; the schema's on the message.
  // A decoy in front uses "tns1" as the envelope binds it (another namespace) and says the
  // opposite, which a client that matches prefixes instead of namespaces would believe.
  std::string decoy =
      "<n:NotificationMessage><n:Topic>tns1:" + topic + "</n:Topic><n:Message><sc:Message "
      "PropertyOperation=\"Changed\"><sc:Source><sc:SimpleItem Name=\"" + source +
      "\"/></sc:Source><sc:Data><sc:SimpleItem Name=\"" + data + "\" Value=\"" +
      (state ? "false" : "true") + "\"/></sc:Data></sc:Message></n:Message></n:NotificationMessage>";
  return decoy +
         "<n:NotificationMessage><n:Topic xmlns:q7=\"http://www.onvif.org/ver10/topics\" "
         "Dialect=\"http://www.onvif.org/ver10/tev/topicExpression/ConcreteSet\">q7:" + topic +
         "</n:Topic><n:Message><m:Message xmlns:m=\"http://www.onvif.org/ver10/schema\" "
         "UtcTime=\"" + Time() + "\" PropertyOperation=\"" + operation + "\"><m:Source>"
         "<m:SimpleItem Name=\"" + source + "\"/></m:Source><m:Data><m:SimpleItem Name=\"" +
         data + "\" Value=\"" + value + "\"/></m:Data></m:Message></n:Message>"
         "</n:NotificationMessage>";
}

void OnvifDevice::PullMessages(HttpConnection& connection, int id, const std::string& body) {
  Request request(body);
  int timeout = std::min(Seconds(request.Text("Timeout"), 10), 600);
  int limit = std::max(1, std::atoi(request.Text("MessageLimit").c_str()));
  auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(timeout);
  std::string messages;
  while (true) {
    {
      std::lock_guard<std::mutex> lock(mutex_);
      auto it = subscriptions_.find(id);
      if (it == subscriptions_.end() || std::chrono::steady_clock::now() > it->second.expires) {
        if (it != subscriptions_.end()) subscriptions_.erase(it);
        break;
      }
      Subscription& s = it->second;
      int count = 0;
      for (const auto& [property, state] : Properties()) {
        if (count >= limit) break;
        auto sent = s.sent.find(property);
        if (s.initialized && sent != s.sent.end() && sent->second == state) continue;
        messages += Notification(property, state, !s.initialized);
        s.sent[property] = state;
        ++count;
      }
      if (count < limit || !s.initialized) s.initialized = true;
      if (!messages.empty() || std::chrono::steady_clock::now() >= deadline) {
        std::string open = options_.unusual_prefixes ? kOddEnvelopeOpen : kEnvelopeOpen;
        std::string close = options_.unusual_prefixes ? kOddEnvelopeClose : kEnvelopeClose;
        std::string p = options_.unusual_prefixes ? "ev:" : "tev:";
        std::string xml = open + "<" + p + "PullMessagesResponse><" + p + "CurrentTime>" +
                          Time() + "</" + p + "CurrentTime><" + p + "TerminationTime>" +
                          UtcText(std::time(nullptr) + options_.clock_offset +
                                  std::chrono::duration_cast<std::chrono::seconds>(
                                      s.expires - std::chrono::steady_clock::now()).count()) +
                          "</" + p + "TerminationTime>" + options_.padding + messages + "</" + p +
                          "PullMessagesResponse>" + close;
        ++counts_["PullMessages"];
        Answer(connection, xml);
        return;
      }
    }
    if (connection.PeerClosed() || !connection.SleepFor(std::chrono::milliseconds(20))) return;
  }
  Answer(connection,
         Fault("s:Receiver", "ter:InvalidArgVal", "the subscription does not exist"), 500);
}

void OnvifDevice::Handle(HttpConnection& connection) {
  const HttpRequest& http = connection.Request();
  const std::string& body = http.body;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    // Tests look at the latest calls; a long camsim run keeps no more than these.
    if (bodies_.size() >= kKeptBodies) bodies_.erase(bodies_.begin());
    bodies_.push_back(body);
  }
  std::string path = http.Path();
  if (http.method != "POST") {
    AnswerNotFound(connection);
    return;
  }
  Request request(body);
  std::string operation = request.Operation();
  if (operation.empty()) {
    Answer(connection, Fault("s:Sender", "ter:WellFormed", "not a SOAP request"), 400);
    return;
  }
  if (operation != "GetSystemDateAndTime" && !TokenValid(body)) {
    {
      std::lock_guard<std::mutex> lock(mutex_);
      ++refused_;
    }
    Answer(connection, Fault("s:Sender", "ter:NotAuthorized", "Sender not authorized"), 400);
    return;
  }
  std::string open = kEnvelopeOpen;
  std::string close = kEnvelopeClose;
  auto count = [this](const std::string& op) {
    std::lock_guard<std::mutex> lock(mutex_);
    ++counts_[op];
  };

  if (path == kDevicePath && operation == "GetSystemDateAndTime") {
    time_t now = std::time(nullptr) + static_cast<time_t>(options_.clock_offset);
    struct tm t;
    gmtime_r(&now, &t);
    char xml[512];
    std::snprintf(xml, sizeof(xml),
                  "<tds:GetSystemDateAndTimeResponse><tds:SystemDateAndTime>"
                  "<tt:DateTimeType>Manual</tt:DateTimeType><tt:DaylightSavings>false"
                  "</tt:DaylightSavings><tt:UTCDateTime><tt:Time><tt:Hour>%d</tt:Hour>"
                  "<tt:Minute>%d</tt:Minute><tt:Second>%d</tt:Second></tt:Time><tt:Date>"
                  "<tt:Year>%d</tt:Year><tt:Month>%d</tt:Month><tt:Day>%d</tt:Day></tt:Date>"
                  "</tt:UTCDateTime></tds:SystemDateAndTime></tds:GetSystemDateAndTimeResponse>",
                  t.tm_hour, t.tm_min, t.tm_sec, t.tm_year + 1900, t.tm_mon + 1, t.tm_mday);
    count(operation);
    Answer(connection, open + xml + close);
    return;
  }
  std::string host = http.Header("Host");
  std::string base = "http://" + (host.empty() ? std::string("127.0.0.1") : host);
  if (path == kDevicePath && operation == "GetCapabilities") {
    count(operation);
    if (!options_.capabilities) {
      Answer(connection, Fault("s:Receiver", "ter:ActionNotSupported", "not supported"), 500);
      return;
    }
    Answer(connection, open + "<tds:GetCapabilitiesResponse><tds:Capabilities><tt:Events><tt:XAddr>" +
                           base + kEventPath + "</tt:XAddr><tt:WSSubscriptionPolicySupport>false"
                           "</tt:WSSubscriptionPolicySupport><tt:WSPullPointSupport>true"
                           "</tt:WSPullPointSupport></tt:Events></tds:Capabilities>"
                           "</tds:GetCapabilitiesResponse>" + close);
    return;
  }
  if (path == kDevicePath && operation == "GetServices") {
    count(operation);
    Answer(connection,
           open + "<tds:GetServicesResponse><tds:Service><tds:Namespace>http://www.onvif.org/"
                  "ver10/device/wsdl</tds:Namespace><tds:XAddr>" + base + kDevicePath +
                  "</tds:XAddr><tds:Version><tt:Major>2</tt:Major><tt:Minor>0</tt:Minor>"
                  "</tds:Version></tds:Service><tds:Service><tds:Namespace>http://www.onvif.org/"
                  "ver10/events/wsdl</tds:Namespace><tds:XAddr>" + base + kEventPath +
                  "</tds:XAddr><tds:Version><tt:Major>2</tt:Major><tt:Minor>0</tt:Minor>"
                  "</tds:Version></tds:Service></tds:GetServicesResponse>" + close);
    return;
  }
  if (path == kEventPath && operation == "CreatePullPointSubscription") {
    int seconds = std::max(1, Seconds(request.Text("InitialTerminationTime"), 60));
    int id;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      id = next_id_++;
      subscriptions_[id].expires = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
      ++counts_[operation];
    }
    time_t now = std::time(nullptr) + static_cast<time_t>(options_.clock_offset);
    std::string reference =
        options_.reference_parameters
            ? "<wsa:Address>" + base + kPullPointPath + "</wsa:Address><wsa:ReferenceParameters>"
              "<sid:SubscriptionId xmlns:sid=\"urn:example:subscription\">" + std::to_string(id) +
              "</sid:SubscriptionId></wsa:ReferenceParameters>"
            : "<wsa:Address>" + base + "/onvif/subscription/" + std::to_string(id) + "</wsa:Address>";
    Answer(connection, open + "<tev:CreatePullPointSubscriptionResponse><tev:SubscriptionReference>" +
                           reference + "</tev:SubscriptionReference><wsnt:CurrentTime>" +
                           UtcText(now) + "</wsnt:CurrentTime><wsnt:TerminationTime>" +
                           UtcText(now + seconds) + "</wsnt:TerminationTime>"
                           "</tev:CreatePullPointSubscriptionResponse>" + close);
    return;
  }
  const std::string prefix = "/onvif/subscription/";
  bool by_reference = options_.reference_parameters && path == kPullPointPath;
  if (by_reference || path.compare(0, prefix.size(), prefix) == 0) {
    // A subscription named by reference parameter must find it in the header.
    xmlNodePtr header = request.Find("Header");
    xmlNodePtr sid = header ? Request::FindIn(header->children, "SubscriptionId") : nullptr;
    int id = 0;
    if (by_reference) {
      if (sid && sid->ns && std::strcmp(reinterpret_cast<const char*>(sid->ns->href),
                                        "urn:example:subscription") == 0) {
        xmlChar* content = xmlNodeGetContent(sid);
        id = content ? std::atoi(reinterpret_cast<const char*>(content)) : 0;
        xmlFree(content);
      }
    } else {
      id = std::atoi(path.c_str() + prefix.size());
    }
    if (operation == "PullMessages") {
      PullMessages(connection, id, body);
      return;
    }
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = subscriptions_.find(id);
    if (it == subscriptions_.end() || std::chrono::steady_clock::now() > it->second.expires) {
      if (it != subscriptions_.end()) subscriptions_.erase(it);
      Answer(connection, Fault("s:Receiver", "ter:InvalidArgVal", "the subscription does not exist"),
             500);
      return;
    }
    ++counts_[operation];
    if (operation == "Renew") {
      int seconds = std::max(1, Seconds(request.Text("TerminationTime"), 60));
      it->second.expires = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
      time_t now = std::time(nullptr) + static_cast<time_t>(options_.clock_offset);
      Answer(connection, open + "<wsnt:RenewResponse><wsnt:TerminationTime>" + UtcText(now + seconds) +
                             "</wsnt:TerminationTime><wsnt:CurrentTime>" + UtcText(now) +
                             "</wsnt:CurrentTime></wsnt:RenewResponse>" + close);
      return;
    }
    if (operation == "Unsubscribe") {
      subscriptions_.erase(it);
      Answer(connection, open + "<wsnt:UnsubscribeResponse/>" + close);
      return;
    }
  }
  Answer(connection, Fault("s:Sender", "ter:ActionNotSupported", "unknown operation"), 400);
}

void OnvifDevice::DropSubscriptions() {
  std::lock_guard<std::mutex> lock(mutex_);
  subscriptions_.clear();
}

int OnvifDevice::Count(const std::string& operation) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = counts_.find(operation);
  return it == counts_.end() ? 0 : it->second;
}

int OnvifDevice::Refused() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return refused_;
}

int OnvifDevice::LiveSubscriptions() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return static_cast<int>(subscriptions_.size());
}

std::vector<std::string> OnvifDevice::Bodies() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return bodies_;
}

namespace {

// camsim's ONVIF cameras: one device per simulated camera, made on its first request.
// alarm_topic: motion as VideoSource/MotionAlarm instead of the cell motion detector.
void HandleOnvif(HttpConnection& connection, CameraState& state, const Login& login,
                 bool alarm_topic) {
  static std::mutex mutex;
  // A camera's state may be freed and another made at its address (simulators run one after
  // another in one process): a new login makes a new device, and a connection still served
  // by the old one keeps it alive until it ends.
  struct Slot {
    std::shared_ptr<OnvifDevice> device;
    Login login;
    bool alarm_topic = false;
  };
  static std::map<CameraState*, Slot> devices;
  std::shared_ptr<OnvifDevice> device;
  {
    std::lock_guard<std::mutex> lock(mutex);
    Slot& slot = devices[&state];
    if (!slot.device || slot.login.required != login.required || slot.login.user != login.user ||
        slot.login.password != login.password || slot.alarm_topic != alarm_topic) {
      slot.login = login;
      slot.alarm_topic = alarm_topic;
      OnvifDeviceOptions options;
      if (login.required) {
        options.user = login.user;
        options.password = login.password;
      }
      options.cell_motion = !alarm_topic;
      options.motion_alarm = alarm_topic;
      options.inputs = 4;
      slot.device = std::make_shared<OnvifDevice>(options, &state);
    }
    device = slot.device;
  }
  device->Handle(connection);
}

}  // namespace

Emulation OnvifEmulation() {
  Emulation e = MakeEmulation("onvif", "ONVIF", nullptr,
                              {
                                  {"OnvifMD", "motion", nullptr},
                                  {"OnvifEID", "inputs", {{"inputs", 1}}},
                              });
  e.handle_with_login = [](HttpConnection& c, CameraState& s, const Login& l) {
    HandleOnvif(c, s, l, false);
  };
  return e;
}

// The same device announcing motion through the video source's MotionAlarm topic, as
// cameras without a cell motion detector do.
Emulation OnvifAlarmEmulation() {
  Emulation e = MakeEmulation("onvifalarm", "ONVIF", nullptr,
                              {
                                  {"OnvifMD", "motion", nullptr},
                              });
  e.handle_with_login = [](HttpConnection& c, CameraState& s, const Login& l) {
    HandleOnvif(c, s, l, true);
  };
  return e;
}

}  // namespace evsim
