#include "framework/inputquery.h"

#include "framework/httpreq.h"

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
