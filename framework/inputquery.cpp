#include "framework/inputquery.h"

#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const int kTimeout = 10;

// These cameras have answered with each of these types over their firmware versions. The
// first test already admits the other two; all three are kept as the family checks them.
bool IsTextAnswer(const CgiRequest& request) {
  return request.ContentTypeIs("text") || request.ContentTypeIs("text/plain") ||
         request.ContentTypeIs("text/html");
}

}  // namespace

bool SendHttpReqAndCheckLine(Camera* camera, std::string path, std::string key,
                             std::string value) {
  CgiRequest request(camera, path, kTimeout);
  if (!IsTextAnswer(request)) return false;
  return MatchKeyValueLines(request.Client(), key, value, LineScan::kModule);
}

InputQueryEID::InputQueryEID(Camera* camera, int inputs, const char* prefix, InputAnswerCheck check)
    : camera_(camera), inputs_(inputs), prefix_(prefix), check_(check) {}

int InputQueryEID::DoEID(bool& active) {
  if (camera_ == nullptr) return -1;
  active = false;
  for (int input = 1; input <= inputs_ && !active; ++input) QueryCamera(input, active);
  return 0;
}

int InputQueryEID::QueryCamera(int input, bool& active) {
  const std::string number = itos(input);
  const std::string path = prefix_ + number, key = "input" + number;
  active = check_ == InputAnswerCheck::kLine ? SendHttpReqAndCheckLine(camera_, path, key, "active")
                                             : SendHttpReqAndCheckResp(camera_, path, key, "active") != 0;
  return 0;
}

int InputQueryEID::EventDetecor() {
  if (camera_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond, [this](bool& active) { return DoEID(active); });
  return 0;
}
