#include "framework/host/onvifevents.h"

#include <curl/curl.h>
#include <libxml/parser.h>
#include <libxml/tree.h>
#include <openssl/evp.h>
#include <openssl/rand.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <mutex>

namespace {

constexpr char kSoapNs[] = "http://www.w3.org/2003/05/soap-envelope";
constexpr char kSchemaNs[] = "http://www.onvif.org/ver10/schema";
constexpr char kDeviceNs[] = "http://www.onvif.org/ver10/device/wsdl";
constexpr char kEventNs[] = "http://www.onvif.org/ver10/events/wsdl";
constexpr char kNotifyNs[] = "http://docs.oasis-open.org/wsn/b-2";
constexpr char kAddressingNs[] = "http://www.w3.org/2005/08/addressing";
constexpr char kTopicsNs[] = "http://www.onvif.org/ver10/topics";
constexpr char kSecurityNs[] =
    "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-wssecurity-secext-1.0.xsd";
constexpr char kUtilityNs[] =
    "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-wssecurity-utility-1.0.xsd";
constexpr char kDigestType[] =
    "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-username-token-profile-1.0"
    "#PasswordDigest";
constexpr char kBase64Type[] =
    "http://docs.oasis-open.org/wss/2004/01/oasis-200401-wss-soap-message-security-1.0"
    "#Base64Binary";

// libcurl's and libxml2's global set-up is not thread-safe; do it once, before any thread's
// first request.
void InitLibrariesOnce() {
  static const bool done = [] {
    curl_global_init(CURL_GLOBAL_DEFAULT);
    xmlInitParser();
    return true;
  }();
  (void)done;
}

std::string XmlEscape(const std::string& text) {
  std::string out;
  out.reserve(text.size());
  for (char c : text) {
    switch (c) {
      case '&': out += "&amp;"; break;
      case '<': out += "&lt;"; break;
      case '>': out += "&gt;"; break;
      case '"': out += "&quot;"; break;
      case '\'': out += "&apos;"; break;
      default: out += c;
    }
  }
  return out;
}

std::string Base64(const unsigned char* data, size_t size) {
  std::string out(4 * ((size + 2) / 3) + 1, '\0');
  int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&out[0]), data,
                          static_cast<int>(size));
  out.resize(n > 0 ? static_cast<size_t>(n) : 0);
  return out;
}

std::string UtcText(time_t t) {
  struct tm tm_utc;
  gmtime_r(&t, &tm_utc);
  char text[32];
  std::strftime(text, sizeof(text), "%Y-%m-%dT%H:%M:%SZ", &tm_utc);
  return text;
}

// xsd:dateTime ("2026-11-25T10:00:00Z", with optional fraction and offset) in seconds since
// the epoch; false when it is not one.
bool ParseDateTime(const std::string& text, time_t& out) {
  struct tm tm_utc = {};
  int consumed = 0;
  if (std::sscanf(text.c_str(), "%4d-%2d-%2dT%2d:%2d:%2d%n", &tm_utc.tm_year, &tm_utc.tm_mon,
                  &tm_utc.tm_mday, &tm_utc.tm_hour, &tm_utc.tm_min, &tm_utc.tm_sec,
                  &consumed) != 6) {
    return false;
  }
  tm_utc.tm_year -= 1900;
  tm_utc.tm_mon -= 1;
  time_t t = timegm(&tm_utc);
  size_t pos = static_cast<size_t>(consumed);
  if (pos < text.size() && text[pos] == '.') {
    ++pos;
    while (pos < text.size() && text[pos] >= '0' && text[pos] <= '9') ++pos;
  }
  if (pos < text.size() && (text[pos] == '+' || text[pos] == '-')) {
    int hours = 0, minutes = 0;
    if (std::sscanf(text.c_str() + pos + 1, "%2d:%2d", &hours, &minutes) == 2) {
      long shift = hours * 3600L + minutes * 60L;
      t += text[pos] == '+' ? -shift : shift;
    }
  }
  out = t;
  return true;
}

// The path of an address the camera gives ("http://10.0.0.5/onvif/events" -> "/onvif/events").
// The camera's host is not taken from it: cameras behind address translation name an address
// that we cannot reach, and we already know one that works.
std::string PathOf(const std::string& address) {
  size_t scheme = address.find("://");
  if (scheme == std::string::npos) return address.empty() || address[0] == '/' ? address : "/" + address;
  size_t slash = address.find('/', scheme + 3);
  return slash == std::string::npos ? "/" : address.substr(slash);
}

std::string Trim(const std::string& text) {
  const char* blanks = " \t\r\n";
  size_t begin = text.find_first_not_of(blanks);
  if (begin == std::string::npos) return "";
  size_t end = text.find_last_not_of(blanks);
  return text.substr(begin, end - begin + 1);
}

// An owned libxml2 document.
struct XmlDoc {
  xmlDocPtr doc = nullptr;
  explicit XmlDoc(const std::string& text) {
    if (text.size() > OnvifEventClient::kMaxAnswerBytes) return;
    // No network, no entity substitution, no messages on stderr: the text is the camera's.
    doc = xmlReadMemory(text.data(), static_cast<int>(text.size()), "answer.xml", nullptr,
                        XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING);
  }
  ~XmlDoc() {
    if (doc) xmlFreeDoc(doc);
  }
  XmlDoc(const XmlDoc&) = delete;
  XmlDoc& operator=(const XmlDoc&) = delete;
  xmlNodePtr Root() const { return doc ? xmlDocGetRootElement(doc) : nullptr; }
};

bool Is(xmlNodePtr node, const char* ns, const char* name) {
  return node && node->type == XML_ELEMENT_NODE && node->ns && node->ns->href &&
         std::strcmp(reinterpret_cast<const char*>(node->ns->href), ns) == 0 &&
         std::strcmp(reinterpret_cast<const char*>(node->name), name) == 0;
}

// The first element at or below node with that namespace and local name, depth first.
xmlNodePtr Find(xmlNodePtr node, const char* ns, const char* name) {
  for (; node; node = node->next) {
    if (node->type != XML_ELEMENT_NODE) continue;
    if (Is(node, ns, name)) return node;
    if (xmlNodePtr found = Find(node->children, ns, name)) return found;
  }
  return nullptr;
}

// Every element below node with that namespace and local name (not below a match).
void FindAll(xmlNodePtr node, const char* ns, const char* name, std::vector<xmlNodePtr>& out) {
  for (; node; node = node->next) {
    if (node->type != XML_ELEMENT_NODE) continue;
    if (Is(node, ns, name)) {
      out.push_back(node);
    } else {
      FindAll(node->children, ns, name, out);
    }
  }
}

xmlNodePtr Child(xmlNodePtr node, const char* ns, const char* name) {
  if (!node) return nullptr;
  for (xmlNodePtr c = node->children; c; c = c->next) {
    if (Is(c, ns, name)) return c;
  }
  return nullptr;
}

std::string Text(xmlNodePtr node) {
  if (!node) return "";
  xmlChar* content = xmlNodeGetContent(node);
  std::string out = content ? reinterpret_cast<const char*>(content) : "";
  xmlFree(content);
  return Trim(out);
}

std::string Attribute(xmlNodePtr node, const char* name) {
  xmlChar* value = xmlGetNoNsProp(node, reinterpret_cast<const xmlChar*>(name));
  std::string out = value ? reinterpret_cast<const char*>(value) : "";
  xmlFree(value);
  return out;
}

// Whether "prefix:Local" (or "Local") names an element of the topic namespace, as the
// prefixes are declared where the topic element stands.
bool TopicSegmentIs(xmlDocPtr doc, xmlNodePtr where, const std::string& segment,
                    const char* local) {
  size_t colon = segment.find(':');
  std::string prefix = colon == std::string::npos ? "" : segment.substr(0, colon);
  std::string name = colon == std::string::npos ? segment : segment.substr(colon + 1);
  if (name != local) return false;
  xmlNsPtr ns = xmlSearchNs(doc, where,
                            prefix.empty() ? nullptr : reinterpret_cast<const xmlChar*>(prefix.c_str()));
  return ns && ns->href && std::strcmp(reinterpret_cast<const char*>(ns->href), kTopicsNs) == 0;
}

// Whether the topic expression is the topic path `path` ("RuleEngine/CellMotionDetector/Motion")
// of the topic namespace. Segments after the first carry no prefix, or one that also names it.
bool TopicIs(xmlDocPtr doc, xmlNodePtr where, const std::string& expression, const char* path) {
  std::vector<std::string> segments, wanted;
  auto split = [](const std::string& text, std::vector<std::string>& out) {
    size_t begin = 0;
    while (true) {
      size_t slash = text.find('/', begin);
      out.push_back(text.substr(begin, slash == std::string::npos ? slash : slash - begin));
      if (slash == std::string::npos) break;
      begin = slash + 1;
    }
  };
  split(expression, segments);
  split(path, wanted);
  if (segments.size() != wanted.size()) return false;
  if (!TopicSegmentIs(doc, where, segments[0], wanted[0].c_str())) return false;
  for (size_t i = 1; i < segments.size(); ++i) {
    if (segments[i].find(':') == std::string::npos) {
      if (segments[i] != wanted[i]) return false;
    } else if (!TopicSegmentIs(doc, where, segments[i], wanted[i].c_str())) {
      return false;
    }
  }
  return true;
}

bool ParseBool(const std::string& text, bool& out) {
  if (text == "true" || text == "1") {
    out = true;
    return true;
  }
  if (text == "false" || text == "0") {
    out = false;
    return true;
  }
  return false;
}

// The Value of the SimpleItem called name under parent (a tt:Source or tt:Data).
bool SimpleItem(xmlNodePtr parent, const char* name, std::string& value) {
  if (!parent) return false;
  for (xmlNodePtr c = parent->children; c; c = c->next) {
    if (Is(c, kSchemaNs, "SimpleItem") && Attribute(c, "Name") == name) {
      value = Attribute(c, "Value");
      return true;
    }
  }
  return false;
}

struct TopicRule {
  OnvifEvent::Topic topic;
  const char* path;
  const char* source_item;
  const char* data_item;
};

constexpr TopicRule kTopicRules[] = {
    {OnvifEvent::Topic::kCellMotion, "RuleEngine/CellMotionDetector/Motion",
     "VideoSourceConfigurationToken", "IsMotion"},
    {OnvifEvent::Topic::kMotionAlarm, "VideoSource/MotionAlarm", "Source", "State"},
    {OnvifEvent::Topic::kDigitalInput, "Device/Trigger/DigitalInput", "InputToken",
     "LogicalState"},
};

void ParseNotifications(const XmlDoc& answer, std::vector<OnvifEvent>& events) {
  std::vector<xmlNodePtr> messages;
  FindAll(answer.Root(), kNotifyNs, "NotificationMessage", messages);
  for (xmlNodePtr notification : messages) {
    xmlNodePtr topic = Child(notification, kNotifyNs, "Topic");
    xmlNodePtr wrapper = Child(notification, kNotifyNs, "Message");
    xmlNodePtr message = Child(wrapper, kSchemaNs, "Message");
    if (!topic || !message) continue;
    std::string expression = Text(topic);
    for (const TopicRule& rule : kTopicRules) {
      if (!TopicIs(answer.doc, topic, expression, rule.path)) continue;
      OnvifEvent event;
      event.topic = rule.topic;
      std::string value;
      if (!SimpleItem(Child(message, kSchemaNs, "Data"), rule.data_item, value) ||
          !ParseBool(value, event.state)) {
        break;
      }
      xmlNodePtr source = Child(message, kSchemaNs, "Source");
      if (!SimpleItem(source, rule.source_item, event.source) && source) {
        // Cameras disagree on the item's name; one source item is the source all the same.
        for (xmlNodePtr c = source->children; c; c = c->next) {
          if (Is(c, kSchemaNs, "SimpleItem")) {
            event.source = Attribute(c, "Value");
            break;
          }
        }
      }
      event.initialized = Attribute(message, "PropertyOperation") == "Initialized";
      events.push_back(std::move(event));
      break;
    }
  }
}

// The element children of a ReferenceParameters, serialized with the namespace declarations
// they use (which the camera may have made on an ancestor).
std::string ReferenceHeaders(xmlNodePtr parameters) {
  std::string out;
  if (!parameters) return out;
  for (xmlNodePtr c = parameters->children; c; c = c->next) {
    if (c->type != XML_ELEMENT_NODE) continue;
    xmlDocPtr holder = xmlNewDoc(reinterpret_cast<const xmlChar*>("1.0"));
    xmlNodePtr copy = xmlDocCopyNode(c, holder, 1);
    if (copy) {
      xmlDocSetRootElement(holder, copy);
      xmlReconciliateNs(holder, copy);
      xmlBufferPtr buffer = xmlBufferCreate();
      if (buffer && xmlNodeDump(buffer, holder, copy, 0, 0) > 0) {
        out.append(reinterpret_cast<const char*>(xmlBufferContent(buffer)),
                   static_cast<size_t>(xmlBufferLength(buffer)));
      }
      if (buffer) xmlBufferFree(buffer);
    }
    xmlFreeDoc(holder);
  }
  return out;
}

}  // namespace

struct OnvifEventClient::Impl {
  explicit Impl(OnvifSettings s) : settings(std::move(s)) {
    settings.pull_timeout = std::max(1, settings.pull_timeout);
    settings.message_limit = std::max(1, settings.message_limit);
    settings.termination = std::max(2, settings.termination);
    settings.io_timeout = std::max(1, settings.io_timeout);
  }

  OnvifSettings settings;
  int64_t clock_offset = 0;           // camera's clock minus ours, seconds
  std::string event_path;             // found once, kept across resubscriptions
  std::string subscription_path;      // empty: not subscribed
  std::string subscription_address;   // as the camera named it, for wsa:To
  std::string reference_headers;      // its ReferenceParameters, echoed as header blocks
  int lifetime = 0;                   // seconds a subscription lives from a renewal
  std::chrono::steady_clock::time_point renew_at;
  std::string last_error;

  std::atomic<bool> interrupted{false};
  std::mutex wait_mutex;
  std::condition_variable wait_cv;    // signalled by Interrupt()

  struct Answer {
    std::string body;
    long status = 0;
    bool too_large = false;
  };

  static size_t OnData(char* data, size_t size, size_t count, void* user) {
    Answer* answer = static_cast<Answer*>(user);
    size_t n = size * count;
    if (answer->body.size() + n > kMaxAnswerBytes) {
      answer->too_large = true;
      return 0;  // ends the transfer
    }
    answer->body.append(data, n);
    return n;
  }

  static int OnProgress(void* user, curl_off_t, curl_off_t, curl_off_t, curl_off_t) {
    return static_cast<std::atomic<bool>*>(user)->load() ? 1 : 0;
  }

  std::string Url(const std::string& path) const {
    std::string host = settings.host;
    if (host.find(':') != std::string::npos && host.front() != '[') host = "[" + host + "]";
    std::string p = path.empty() || path[0] != '/' ? "/" + path : path;
    return "http://" + host + ":" + std::to_string(settings.port) + p;
  }

  // Never let a camera's fault text carry the password back into a log.
  std::string Clean(std::string text) const {
    if (text.size() > 200) text.resize(200);
    if (!settings.password.empty()) {
      size_t at;
      while ((at = text.find(settings.password)) != std::string::npos) {
        text.replace(at, settings.password.size(), "***");
      }
    }
    return text;
  }

  std::string SecurityHeader() const {
    if (settings.user.empty()) return "";
    unsigned char nonce[16];
    if (RAND_bytes(nonce, sizeof(nonce)) != 1) {
      for (unsigned char& b : nonce) b = static_cast<unsigned char>(std::rand());
    }
    std::string created = UtcText(std::time(nullptr) + static_cast<time_t>(clock_offset));
    std::string material(reinterpret_cast<const char*>(nonce), sizeof(nonce));
    material += created;
    material += settings.password;
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned int digest_size = 0;
    EVP_Digest(material.data(), material.size(), digest, &digest_size, EVP_sha1(), nullptr);
    std::fill(material.begin(), material.end(), '\0');
    return std::string("<wsse:Security s:mustUnderstand=\"1\" xmlns:wsse=\"") + kSecurityNs +
           "\" xmlns:wsu=\"" + kUtilityNs + "\"><wsse:UsernameToken><wsse:Username>" +
           XmlEscape(settings.user) + "</wsse:Username><wsse:Password Type=\"" + kDigestType +
           "\">" + Base64(digest, digest_size) + "</wsse:Password><wsse:Nonce EncodingType=\"" +
           kBase64Type + "\">" + Base64(nonce, sizeof(nonce)) + "</wsse:Nonce><wsu:Created>" +
           created + "</wsu:Created></wsse:UsernameToken></wsse:Security>";
  }

  std::string Envelope(const std::string& action, const std::string& to, const std::string& body,
                       bool secure, const std::string& references = "") const {
    std::string header = secure ? SecurityHeader() : "";
    header += references;
    header += "<wsa:Action>" + std::string(action) + "</wsa:Action>";
    if (!to.empty()) header += "<wsa:To>" + XmlEscape(to) + "</wsa:To>";
    return std::string("<?xml version=\"1.0\" encoding=\"UTF-8\"?><s:Envelope xmlns:s=\"") +
           kSoapNs + "\" xmlns:tds=\"" + kDeviceNs + "\" xmlns:tev=\"" + kEventNs +
           "\" xmlns:tt=\"" + kSchemaNs + "\" xmlns:wsnt=\"" + kNotifyNs + "\" xmlns:wsa=\"" +
           kAddressingNs + "\"><s:Header>" + header + "</s:Header><s:Body>" + body +
           "</s:Body></s:Envelope>";
  }

  // Posts one request; fills answer. False on a transport failure, an interruption or an
  // answer over the bound (last_error says which).
  bool Post(const std::string& path, const std::string& action, const std::string& envelope,
            int timeout, bool interruptible, Answer& answer) {
    InitLibrariesOnce();
    CURL* curl = curl_easy_init();
    if (!curl) {
      last_error = "cannot create an HTTP request";
      return false;
    }
    std::string url = Url(path);
    std::string type = "Content-Type: application/soap+xml; charset=utf-8; action=\"" + action + "\"";
    struct curl_slist* headers = curl_slist_append(nullptr, type.c_str());
    headers = curl_slist_append(headers, "Expect:");
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_HTTPHEADER, headers);
    curl_easy_setopt(curl, CURLOPT_POSTFIELDS, envelope.data());
    curl_easy_setopt(curl, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(envelope.size()));
    curl_easy_setopt(curl, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(curl, CURLOPT_CONNECTTIMEOUT, static_cast<long>(settings.io_timeout));
    curl_easy_setopt(curl, CURLOPT_TIMEOUT, static_cast<long>(timeout));
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, &Impl::OnData);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &answer);
    std::atomic<bool> never{false};
    curl_easy_setopt(curl, CURLOPT_NOPROGRESS, 0L);
    curl_easy_setopt(curl, CURLOPT_XFERINFOFUNCTION, &Impl::OnProgress);
    curl_easy_setopt(curl, CURLOPT_XFERINFODATA, interruptible ? &interrupted : &never);
    if (!settings.user.empty()) {
      curl_easy_setopt(curl, CURLOPT_HTTPAUTH, CURLAUTH_BASIC | CURLAUTH_DIGEST);
      curl_easy_setopt(curl, CURLOPT_USERNAME, settings.user.c_str());
      curl_easy_setopt(curl, CURLOPT_PASSWORD, settings.password.c_str());
    }
    CURLcode code = curl_easy_perform(curl);
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &answer.status);
    curl_slist_free_all(headers);
    curl_easy_cleanup(curl);
    if (answer.too_large) {
      last_error = "answer longer than " + std::to_string(kMaxAnswerBytes) + " bytes";
      return false;
    }
    if (code == CURLE_ABORTED_BY_CALLBACK) {
      last_error = "interrupted";
      return false;
    }
    if (code != CURLE_OK) {
      last_error = std::string("HTTP: ") + curl_easy_strerror(code);
      return false;
    }
    return true;
  }

  // One SOAP call: the parsed answer when it is a 2xx answer without a fault.
  std::unique_ptr<XmlDoc> Call(const char* what, const std::string& path, const std::string& action,
                               const std::string& body, bool secure, int timeout = 0,
                               bool interruptible = false) {
    Answer answer;
    // Calls to the subscription carry its address and reference parameters: cameras that
    // serve every pull point at one path tell them apart by these.
    bool to_subscription = !subscription_path.empty() && path == subscription_path;
    std::string envelope = Envelope(action, to_subscription ? subscription_address : "",
                                    body, secure, to_subscription ? reference_headers : "");
    if (!Post(path, action, envelope, timeout > 0 ? timeout : settings.io_timeout, interruptible,
              answer)) {
      last_error = std::string(what) + ": " + last_error;
      return nullptr;
    }
    auto doc = std::make_unique<XmlDoc>(answer.body);
    xmlNodePtr body_node = Child(doc->Root(), kSoapNs, "Body");
    xmlNodePtr fault = body_node ? Child(body_node, kSoapNs, "Fault") : nullptr;
    if (answer.status < 200 || answer.status > 299 || fault || !body_node) {
      std::string reason;
      if (fault) {
        std::vector<xmlNodePtr> values;
        FindAll(fault, kSoapNs, "Value", values);
        for (xmlNodePtr v : values) reason += (reason.empty() ? "" : " ") + Text(v);
        std::string text = Text(Find(fault->children, kSoapNs, "Text"));
        if (!text.empty()) reason += (reason.empty() ? "" : ": ") + text;
      } else if (!body_node && answer.status >= 200 && answer.status <= 299) {
        reason = "not a SOAP answer";
      }
      last_error = std::string(what) + ": HTTP " + std::to_string(answer.status) +
                   (reason.empty() ? "" : " " + Clean(reason));
      if (reason.find("NotAuthorized") != std::string::npos || answer.status == 401) {
        last_error += " (check the camera's user name and password)";
      }
      return nullptr;
    }
    return doc;
  }

  bool ReadClock() {
    auto doc = Call("GetSystemDateAndTime", settings.device_path,
                    std::string(kDeviceNs) + "/GetSystemDateAndTime",
                    "<tds:GetSystemDateAndTime/>", false);
    if (!doc) return false;
    xmlNodePtr utc = Find(doc->Root(), kSchemaNs, "UTCDateTime");
    xmlNodePtr date = Child(utc, kSchemaNs, "Date");
    xmlNodePtr time_node = Child(utc, kSchemaNs, "Time");
    if (!date || !time_node) {
      clock_offset = 0;  // a camera that keeps its clock to itself: trust ours
      return true;
    }
    struct tm tm_utc = {};
    tm_utc.tm_year = std::atoi(Text(Child(date, kSchemaNs, "Year")).c_str()) - 1900;
    tm_utc.tm_mon = std::atoi(Text(Child(date, kSchemaNs, "Month")).c_str()) - 1;
    tm_utc.tm_mday = std::atoi(Text(Child(date, kSchemaNs, "Day")).c_str());
    tm_utc.tm_hour = std::atoi(Text(Child(time_node, kSchemaNs, "Hour")).c_str());
    tm_utc.tm_min = std::atoi(Text(Child(time_node, kSchemaNs, "Minute")).c_str());
    tm_utc.tm_sec = std::atoi(Text(Child(time_node, kSchemaNs, "Second")).c_str());
    clock_offset = static_cast<int64_t>(timegm(&tm_utc)) - static_cast<int64_t>(std::time(nullptr));
    return true;
  }

  bool FindEventService() {
    if (!settings.event_path.empty()) {
      event_path = settings.event_path;
      return true;
    }
    if (!event_path.empty()) return true;
    auto caps = Call("GetCapabilities", settings.device_path,
                     std::string(kDeviceNs) + "/GetCapabilities",
                     "<tds:GetCapabilities><tds:Category>Events</tds:Category></tds:GetCapabilities>",
                     true);
    if (caps) {
      std::string address = Text(Child(Find(caps->Root(), kSchemaNs, "Events"), kSchemaNs, "XAddr"));
      if (!address.empty()) {
        event_path = PathOf(address);
        return true;
      }
    }
    std::string caps_error = last_error;
    auto services = Call("GetServices", settings.device_path, std::string(kDeviceNs) + "/GetServices",
                         "<tds:GetServices><tds:IncludeCapability>false</tds:IncludeCapability>"
                         "</tds:GetServices>",
                         true);
    if (!services) {
      if (!caps_error.empty()) last_error = caps_error + "; " + last_error;
      return false;
    }
    std::vector<xmlNodePtr> list;
    FindAll(services->Root(), kDeviceNs, "Service", list);
    for (xmlNodePtr service : list) {
      if (Text(Child(service, kDeviceNs, "Namespace")) == kEventNs) {
        event_path = PathOf(Text(Child(service, kDeviceNs, "XAddr")));
        if (!event_path.empty()) return true;
      }
    }
    last_error = "the camera names no event service";
    return false;
  }

  // Sets the renewal time from a subscription's CurrentTime and TerminationTime (the
  // camera's clock on both sides, so our clock's error does not matter).
  void ScheduleRenewal(const XmlDoc& doc) {
    time_t current = 0, termination = 0;
    int left = settings.termination;
    if (ParseDateTime(Text(Find(doc.Root(), kNotifyNs, "CurrentTime")), current) &&
        ParseDateTime(Text(Find(doc.Root(), kNotifyNs, "TerminationTime")), termination) &&
        termination > current) {
      left = static_cast<int>(std::min<time_t>(termination - current, 86400));
    }
    lifetime = std::max(1, left / 3);
    renew_at = std::chrono::steady_clock::now() + std::chrono::seconds(lifetime);
  }

  bool Renew() {
    std::string path = subscription_path;
    auto doc = Call("Renew", path, "http://docs.oasis-open.org/wsn/bw-2/SubscriptionManager/RenewRequest",
                    "<wsnt:Renew><wsnt:TerminationTime>PT" + std::to_string(settings.termination) +
                        "S</wsnt:TerminationTime></wsnt:Renew>",
                    true);
    if (!doc) return false;
    ScheduleRenewal(*doc);
    return true;
  }
};

OnvifEventClient::OnvifEventClient(OnvifSettings settings)
    : impl_(std::make_unique<Impl>(std::move(settings))) {}

OnvifEventClient::~OnvifEventClient() = default;

int OnvifEventClient::Subscribe() {
  Impl& d = *impl_;
  d.subscription_path.clear();
  // A camera that will not tell its time may still take a token signed with ours; if it
  // does not, the next call says so.
  d.ReadClock();
  if (!d.FindEventService()) return -1;
  auto doc = d.Call("CreatePullPointSubscription", d.event_path,
                    std::string(kEventNs) + "/EventPortType/CreatePullPointSubscriptionRequest",
                    "<tev:CreatePullPointSubscription><tev:InitialTerminationTime>PT" +
                        std::to_string(d.settings.termination) +
                        "S</tev:InitialTerminationTime></tev:CreatePullPointSubscription>",
                    true);
  if (!doc) return -1;
  xmlNodePtr reference = Find(doc->Root(), kEventNs, "SubscriptionReference");
  std::string address = Text(Child(reference, kAddressingNs, "Address"));
  // A camera that names no address serves the pull point at the event service itself.
  d.subscription_path = address.empty() ? d.event_path : PathOf(address);
  d.subscription_address = address;
  d.reference_headers = ReferenceHeaders(Child(reference, kAddressingNs, "ReferenceParameters"));
  d.ScheduleRenewal(*doc);
  d.last_error.clear();
  return 0;
}

int OnvifEventClient::Pull(std::vector<OnvifEvent>& events) {
  Impl& d = *impl_;
  if (d.subscription_path.empty()) {
    d.last_error = "not subscribed";
    return -1;
  }
  if (d.interrupted.load()) {
    d.last_error = "interrupted";
    return -1;
  }
  if (std::chrono::steady_clock::now() >= d.renew_at && !d.Renew()) {
    d.subscription_path.clear();
    return -1;
  }
  // The poll ends before the renewal falls due, so a long poll never outlives the subscription.
  int wait = std::min(d.settings.pull_timeout, std::max(1, d.lifetime));
  auto doc = d.Call("PullMessages", d.subscription_path,
                    std::string(kEventNs) + "/PullPointSubscription/PullMessagesRequest",
                    "<tev:PullMessages><tev:Timeout>PT" + std::to_string(wait) +
                        "S</tev:Timeout><tev:MessageLimit>" +
                        std::to_string(d.settings.message_limit) +
                        "</tev:MessageLimit></tev:PullMessages>",
                    true, wait + d.settings.io_timeout, true);
  if (!doc || !Find(doc->Root(), kEventNs, "PullMessagesResponse")) {
    if (doc) d.last_error = "PullMessages: not a PullMessagesResponse";
    // An interrupted poll leaves the subscription as it was, for Unsubscribe to end it.
    if (!d.interrupted.load()) d.subscription_path.clear();
    return -1;
  }
  ParseNotifications(*doc, events);
  d.last_error.clear();
  return 0;
}

void OnvifEventClient::Unsubscribe() {
  Impl& d = *impl_;
  if (d.subscription_path.empty()) return;
  d.Call("Unsubscribe", d.subscription_path,
         "http://docs.oasis-open.org/wsn/bw-2/SubscriptionManager/UnsubscribeRequest",
         "<wsnt:Unsubscribe/>", true);
  d.subscription_path.clear();
}

bool OnvifEventClient::Subscribed() const { return !impl_->subscription_path.empty(); }

bool OnvifEventClient::WaitInterruptible(int millis) {
  std::unique_lock<std::mutex> lock(impl_->wait_mutex);
  return !impl_->wait_cv.wait_for(lock, std::chrono::milliseconds(std::max(0, millis)),
                                  [this] { return impl_->interrupted.load(); });
}

void OnvifEventClient::Interrupt() {
  {
    std::lock_guard<std::mutex> lock(impl_->wait_mutex);
    impl_->interrupted.store(true);
  }
  impl_->wait_cv.notify_all();
}

void OnvifEventClient::ClearInterrupt() {
  std::lock_guard<std::mutex> lock(impl_->wait_mutex);
  impl_->interrupted.store(false);
}

bool OnvifEventClient::Interrupted() const { return impl_->interrupted.load(); }

int64_t OnvifEventClient::ClockOffset() const { return impl_->clock_offset; }

std::string OnvifEventClient::LastError() const { return impl_->last_error; }
