#include "framework/host/cameraapi.h"

#include <utility>

CameraAPI::CameraAPI(CameraAPIRecord record)
    : record_(std::move(record)), cap_(record_.api) {}

CameraAPI::~CameraAPI() = default;

int CameraAPI::PrepareStream(int a, int b) {
  std::lock_guard<std::mutex> lock(mutex_);
  selection_[std::this_thread::get_id()] = {a, b};
  return 0;
}

int CameraAPI::GetStreamPath(std::string& path, int& port) {
  const StreamLocation* found = nullptr;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    auto chosen = selection_.find(std::this_thread::get_id());
    if (chosen != selection_.end()) {
      auto stream = record_.streams.find(chosen->second);
      if (stream != record_.streams.end()) found = &stream->second;
    }
  }
  if (found == nullptr && record_.stream) found = &*record_.stream;
  if (found == nullptr) return -1;
  path = found->path;
  port = found->port;
  return 0;
}

int CameraAPI::GetMDParams(int& p1, int& p2, int& p3, int& p4) {
  p1 = record_.md_params[0];
  p2 = record_.md_params[1];
  p3 = record_.md_params[2];
  p4 = record_.md_params[3];
  return 0;
}
