// Camera-API descriptor: the model-specific data of a camera (API name, stream paths and
// ports, motion parameters), described by a plain CameraAPIRecord.
//
// Threads: any number of detector threads may use one descriptor at once. The stream chosen
// by PrepareStream() is remembered per calling thread, so two detectors of one camera can
// prepare different streams and then ask GetStreamPath() without mixing their choices.

#ifndef EVWATCH_FRAMEWORK_HOST_CAMERAAPI_H_
#define EVWATCH_FRAMEWORK_HOST_CAMERAAPI_H_

#include <array>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <utility>

// The camera's capabilities as the host names them; GetAPI() is the model's API name
// (for example "zaviovga").
class CameraCap {
 public:
  explicit CameraCap(std::string api = "") : api_(std::move(api)) {}
  std::string GetAPI() const { return api_; }

 private:
  std::string api_;
};

struct StreamLocation {
  std::string path;  // with its query; relative or absolute as the model needs
  int port = 80;
};

struct CameraAPIRecord {
  std::string api;                                      // CameraCap::GetAPI()
  std::optional<StreamLocation> stream;                 // the default stream
  std::map<std::pair<int, int>, StreamLocation> streams;  // by PrepareStream(a, b)
  std::array<int, 4> md_params{{0, 0, 0, 0}};           // GetMDParams outputs, in order
};

class CameraAPI {
 public:
  explicit CameraAPI(CameraAPIRecord record);
  CameraAPI(const CameraAPI&) = delete;
  CameraAPI& operator=(const CameraAPI&) = delete;

  // Selects the stream that this thread's next GetStreamPath() gives. Returns 0.
  virtual int PrepareStream(int a, int b);
  // The stream selected by this thread's last PrepareStream(a, b) when one is configured
  // for that pair, else the default stream. Returns 0 and writes both outputs, or -1 and
  // leaves them untouched when no stream is configured.
  virtual int GetStreamPath(std::string& path, int& port);
  // The configured motion parameters (the second is the motion threshold). Returns 0.
  virtual int GetMDParams(int& p1, int& p2, int& p3, int& p4);
  virtual ~CameraAPI();

  CameraCap* GetCameraCap() { return &cap_; }

 private:
  const CameraAPIRecord record_;
  CameraCap cap_;
  std::mutex mutex_;
  std::map<std::thread::id, std::pair<int, int>> selection_;  // guarded by mutex_
};

#endif  // EVWATCH_FRAMEWORK_HOST_CAMERAAPI_H_
