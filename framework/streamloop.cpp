#include "framework/streamloop.h"

#include <new>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"

std::unique_ptr<MultipartFetch> OpenPartStream(const Camera& camera, const std::string& path,
                                               int port, int timeout) {
  try {
    return std::make_unique<MultipartFetch>(camera.GetHost().c_str(), port, path.c_str(),
                                            camera.GetUsername().c_str(),
                                            camera.GetPassword().c_str(), timeout);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}

bool GetApiStream(CameraAPI& api, std::string& path, int& port) {
  port = 80;
  return api.GetStreamPath(path, port) == 0;
}
