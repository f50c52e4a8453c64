#include "framework/httpreq.h"

#include <strings.h>

#include <cstdio>
#include <cstring>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/httpclient.h"

namespace {

const int kLineSize = 1024;
const int kMaxLines = 10;
const int kTimeout = 10;

bool BeginsWith(const char* text, const std::string& prefix) {
  return strncasecmp(text, prefix.c_str(), prefix.size()) == 0;
}

}  // namespace

CgiRequest::CgiRequest(Camera* camera, const std::string& path, int timeout, int workSize,
                       ContentTypeRule rule) {
  if (camera == nullptr) return;
  client_.reset(new VoHttpClient(camera->GetHost(), camera->GetPort(), path,
                                 camera->GetUsername(), camera->GetPassword(), timeout));
  int status = 0;
  std::string contentType;
  if (client_->SendRequest(VO_HTTP_GET) != 0) return;
  if (client_->CheckResponse(status) != 0) return;
  if (rule == ContentTypeRule::kIgnored) {
    ok_ = true;
    return;
  }
  if (client_->GetHttpContent(HTTP_CONTENT_TYPE, contentType) != 0) return;
  std::vector<char> work(static_cast<size_t>(workSize));
  snprintf(work.data(), work.size(), "%s", contentType.c_str());
  char* save = nullptr;
  const char* token = strtok_r(work.data(), " :;=", &save);
  if (token == nullptr) return;
  token_ = token;
  ok_ = true;
}

CgiRequest::~CgiRequest() = default;

bool CgiRequest::ContentTypeIs(const char* type) const {
  return ok_ && strncasecmp(token_.c_str(), type, strlen(type)) == 0;
}

bool MatchKeyValueLines(VoHttpClient& client, const std::string& key, const std::string& value,
                        LineScan style) {
  char line[kLineSize];
  bool matched = false;
  for (int i = 0; i < kMaxLines; ++i) {
    if (client.ReadToLineEnd(line, kLineSize) < 0) break;
    if (line[0] == '\0') {
      if (style == LineScan::kShared) break;
      continue;
    }
    char* save = nullptr;
    const char* name = strtok_r(line, " :=", &save);
    if (name == nullptr) break;
    if (!BeginsWith(name, key)) continue;
    const char* found = strtok_r(nullptr, " ", &save);
    if (found == nullptr) break;
    if (BeginsWith(found, value)) {
      matched = true;
      if (style == LineScan::kModule) break;
    }
  }
  return matched;
}

int SendHttpReqAndCheckResp(Camera* camera, std::string path, std::string key,
                            std::string value) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.ContentTypeIs("text")) return 0;
  return MatchKeyValueLines(request.Client(), key, value, LineScan::kShared) ? 1 : 0;
}

int SendHttpReqAndGetResp(Camera* camera, std::string path, std::string key,
                          std::string& value) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.ContentTypeIs("text")) return -1;
  char line[kLineSize];
  for (int i = 0; i < kMaxLines; ++i) {
    if (request.Client().ReadToLineEnd(line, kLineSize) < 0) return -1;
    if (line[0] == '\0') break;
    char* save = nullptr;
    const char* name = strtok_r(line, " :=", &save);
    if (name == nullptr) return -1;
    if (!BeginsWith(name, key)) continue;
    const char* found = strtok_r(nullptr, " '", &save);
    if (found == nullptr) return -1;
    value = found;
  }
  return 0;
}
