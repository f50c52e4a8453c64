#include "detectors/hikvision.h"

#include <libxml/parser.h>
#include <libxml/tree.h>
#include <libxml/xmlerror.h>

#include <cstdlib>
#include <cstring>
#include <list>
#include <mutex>
#include <new>
#include <optional>
#include <string>

#include "framework/host/camera.h"
#include "framework/host/xmlutil.h"
#include "framework/keypath.h"
#include "framework/streamloop.h"
#include "framework/streampart.h"

namespace {

const char kAlertStreamPath[] = "/Event/notification/alertStream";
const int kCounterWrap = 2147483647;

enum AlertResult { kNoPart = 0, kNotJudged = 1, kNoEvent = 2, kEvent = 3 };

// A camera's broken record is not worth a line on stderr: nothing is logged here.
void IgnoreXmlMessage(void*, const char*, ...) {}

bool LookUp(xmlDoc* doc, const char* key, std::string& value) {
  std::list<std::string> path;
  SplitKeyPath(key, path);
  return FindXmlKeyVal(doc, path, value) == 0;
}

// Parses one record and returns judge(doc) when its eventType is `type`, else kNotJudged.
// Every use of libxml2 here runs under XmlLock and ends with xmlCleanupParser, also after a
// record that did not parse: the thread that next takes the lock then finds libxml2 as
// freshly loaded, so no thread ever holds per-thread libxml2 state that another thread's
// clean-up would orphan.
template <typename Judge>
int JudgeRecord(const char* body, int length, const char* type, Judge&& judge) {
  std::lock_guard<std::mutex> lock(XmlLock());
  int result = kNotJudged;
  xmlSetGenericErrorFunc(nullptr, IgnoreXmlMessage);
  const int text = length > 0 ? static_cast<int>(strnlen(body, static_cast<size_t>(length))) : 0;
  xmlDoc* doc = xmlParseMemory(body, text);
  if (doc != nullptr) {
    try {
      std::string event_type;
      if (LookUp(doc, "EventNotificationAlert/eventType", event_type) && event_type == type) {
        result = judge(doc);
      }
    } catch (const std::bad_alloc&) {
      result = kNotJudged;
    }
    xmlFreeDoc(doc);
  }
  xmlCleanupParser();
  return result;
}

// Reads one part (a cleared stack buffer, or a heap buffer of exactly the part's length)
// and, when it is this pass's turn, judges it with judge(body, length).
template <typename Judge>
int ReadAlertPart(MultipartFetch* fetch, bool turn, Judge&& judge) {
  if (fetch == nullptr) return kNoPart;
  StreamPart part;
  switch (part.Read(fetch, true)) {
    case StreamPart::kNoHeader:
      return kNoPart;
    case StreamPart::kNoBody:
      return kNotJudged;
    case StreamPart::kRead:
      break;
  }
  return turn ? judge(part.Body(), part.Length()) : kNotJudged;
}

// The worker loop of both machines. pass(fetch, reading) makes one pass, fills the reading
// to report and returns its result code. The counter counts every pass and wraps to 0 on
// reaching kCounterWrap.
template <typename Pass>
void RunAlertLoop(DetectorBase& detector, EventBuf* buffer, const Camera& camera, const char* path,
                  int& counter, Pass&& pass) {
  bool first = true;
  RunStreamLoop(detector, buffer, camera, path, camera.GetPort(),
                [&](MultipartFetch* fetch) -> std::optional<PassReport> {
                  PassReport reading{false, 0};
                  const int result = pass(fetch, reading);
                  std::optional<PassReport> report;
                  if (result == kNoPart) {
                    report = PassReport{false, 0};
                  } else if (result != kNotJudged && !first) {
                    report = reading;
                  }
                  first = false;
                  counter = counter >= kCounterWrap - 1 ? 0 : counter + 1;
                  return report;
                });
}

}  // namespace

HikVisionMD::HikVisionMD(Camera* camera) : HikVisionMD(camera, kAlertStreamPath) {}

HikVisionMD::HikVisionMD(Camera* camera, const char* path)
    : camera_(camera), path_(path), last_post_count_(0), part_counter_(0) {}

HikVisionMD::~HikVisionMD() { StopIfStarted(); }

int HikVisionMD::DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level) {
  motion = false;
  level = 0;
  const int result = ReadAlertPart(fetch, part_counter_ % 4 == 1, [this](char* body, int length) {
    return IsMotionDetected(body, length);
  });
  if (result == kEvent) {
    motion = true;
    level = 100;
  }
  return result;
}

int HikVisionMD::IsMotionDetected(char* body, int length) {
  return JudgeRecord(body, length, "VMD", [this](xmlDoc* doc) {
    std::string text;
    if (!LookUp(doc, "EventNotificationAlert/activePostCount", text)) return kNotJudged;
    const unsigned int count = static_cast<unsigned int>(strtol(text.c_str(), nullptr, 10));
    if (count == last_post_count_) return kNoEvent;
    last_post_count_ = count;
    return kEvent;
  });
}

int HikVisionMD::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunAlertLoop(*this, event_buffer_, *camera_, path_, part_counter_,
               [this](MultipartFetch* fetch, PassReport& reading) {
                 bool motion = false;
                 unsigned int level = 0;
                 const int result = DoMD(fetch, motion, level);
                 reading = PassReport{motion, static_cast<int>(level)};
                 return result;
               });
  return 0;
}

HikVisionEID::HikVisionEID(Camera* camera, int input)
    : HikVisionEID(camera, input, kAlertStreamPath) {}

HikVisionEID::HikVisionEID(Camera* camera, int input, const char* path)
    : camera_(camera), input_(input), path_(path), part_counter_(0) {}

HikVisionEID::~HikVisionEID() { StopIfStarted(); }

int HikVisionEID::DoEID(MultipartFetch* fetch, bool& active) {
  active = false;
  const int result = ReadAlertPart(fetch, part_counter_ % 4 == 0, [this](char* body, int length) {
    return IsEventDetected(body, length);
  });
  active = result == kEvent;
  return result;
}

int HikVisionEID::IsEventDetected(char* body, int length) {
  return JudgeRecord(body, length, "IO", [](xmlDoc* doc) {
    std::string state;
    if (!LookUp(doc, "EventNotificationAlert/eventState", state)) return kNotJudged;
    return state == "active" ? kEvent : kNoEvent;
  });
}

int HikVisionEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunAlertLoop(*this, event_buffer_, *camera_, path_, part_counter_,
               [this](MultipartFetch* fetch, PassReport& reading) {
                 bool active = false;
                 const int result = DoEID(fetch, active);
                 reading = PassReport{active, 1};
                 return result;
               });
  return 0;
}
