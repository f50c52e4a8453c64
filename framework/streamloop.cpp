#include "framework/streamloop.h"

#include <new>

#include "framework/host/camera.h"

std::unique_ptr<MultipartFetch> OpenPartStream(const Camera& camera, const std::string& path,
                                               int port) {
  try {
    return std::make_unique<MultipartFetch>(camera.GetHost().c_str(), port, path.c_str(),
                                            camera.GetUsername().c_str(),
                                            camera.GetPassword().c_str(), kStreamTimeout);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}
