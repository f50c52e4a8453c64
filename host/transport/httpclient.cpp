#include "framework/host/httpclient.h"

#include <algorithm>
#include <cstring>

#include "host/transport/httppull.h"
#include "host/transport/linesplit.h"

VoHttpClient::VoHttpClient(std::string host, int port, std::string path, std::string user,
                           std::string password, int timeout)
    : pull_(std::make_unique<HttpPull>(HttpPull::Target{std::move(host), port, std::move(path),
                                                        std::move(user), std::move(password),
                                                        timeout})) {}

VoHttpClient::~VoHttpClient() = default;

int VoHttpClient::SendRequest(__tag_VO_HTTP_METHOD method) {
  if (method != VO_HTTP_GET && method != VO_HTTP_HEAD) return -1;
  return pull_->Start(method == VO_HTTP_HEAD) ? 0 : -1;
}

int VoHttpClient::CheckResponse(int& status) {
  status = pull_->Status();
  return (status >= 200 && status <= 299) ? 0 : -1;
}

int VoHttpClient::GetHttpContent(__tag_HTTP_MAP_KEY key, std::string& value) {
  const char* name = nullptr;
  switch (key) {
    case HTTP_CONTENT_TYPE:
      name = "Content-Type";
      break;
    case HTTP_CONTENT_LENGTH:
      name = "Content-Length";
      break;
  }
  if (name == nullptr) return -1;
  return pull_->Header(name, &value) ? 0 : -1;
}

int VoHttpClient::ReadData(char* buffer, int size) {
  if (buffer == nullptr || size < 0) return -1;
  int count = 0;
  while (count < size) {
    size_t take = std::min(pull_->Buffered(), static_cast<size_t>(size - count));
    if (take > 0) {
      std::memcpy(buffer + count, pull_->Data(), take);
      pull_->Consume(take);
      count += static_cast<int>(take);
      continue;
    }
    switch (pull_->Fill(1)) {
      case HttpPull::Wait::kReady:
        break;
      case HttpPull::Wait::kEnded:
        return count;
      case HttpPull::Wait::kFailed:
        return -1;  // the body is broken: what came of it is not to be trusted
      case HttpPull::Wait::kTimedOut:
        return count > 0 ? count : -1;
    }
  }
  return count;
}

int VoHttpClient::ReadToLineEnd(char* buffer, int size) {
  if (buffer == nullptr || size < 2) return -1;
  const size_t limit = static_cast<size_t>(size) - 1;
  bool ended = false;
  for (;;) {
    LineSplit split = SplitLine(pull_->Data(), pull_->Buffered(), limit, ended);
    if (split.found) {
      std::memcpy(buffer, pull_->Data(), split.stored);
      buffer[split.stored] = '\0';
      pull_->Consume(split.consumed);
      return static_cast<int>(split.stored);
    }
    if (ended) return -1;
    HttpPull::Wait wait = pull_->Fill(pull_->Buffered() + 1);
    if (wait == HttpPull::Wait::kEnded) {
      ended = true;
    } else if (wait != HttpPull::Wait::kReady) {
      return -1;
    }
  }
}
