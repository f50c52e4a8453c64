#include "apps/evwatch/runner.h"

#include <atomic>
#include <chrono>
#include <algorithm>
#include <functional>
#include <nlohmann/json.hpp>
#include <system_error>
#include <thread>

#include "apps/evwatch/framereceiver.h"
#include "apps/evwatch/registry.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/delaytimer.h"
#include "framework/host/eventbuf.h"
#include "framework/host/streambuffer.h"

namespace evwatch {
namespace {

// How long the detectors' start waits for the cameras' first frames, so that readers of a
// frame buffer do not begin on an empty one.
constexpr std::chrono::seconds kFirstFrameWait(3);

}  // namespace

// A detector as it runs: its entry, the interval it was bound with, its buffer.
struct Runner::DetectorUnit {
  DetectorConfig config;
  int interval = 0;
  std::unique_ptr<EventBuf> buffer;
  // Declared after buffer so that it is destroyed (stopped) first.
  std::unique_ptr<EventDetector> detector;
};

// A camera as it runs: its entry, its records, its frame receiver and its detectors.
struct Runner::CameraUnit {
  CameraConfig config;
  std::unique_ptr<Camera> camera;
  std::unique_ptr<CameraAPI> api;
  std::unique_ptr<FrameReceiver> receiver;  // fills the frame buffer; null without frames:
  // Declared last: destroyed first, since they use everything above.
  std::vector<std::unique_ptr<DetectorUnit>> detectors;
};

namespace {

// Everything of a camera entry but its detectors, as one comparable text: two entries with
// the same key need no new Camera, API or receiver.
std::string CameraKey(const CameraConfig& c) {
  const CameraRecord& r = c.record;
  nlohmann::json key = {r.host, r.port, r.username, r.password, r.id, r.channel, r.stream_type,
                        r.video_type, r.sensitivity, r.threshold, c.api.api, c.api.md_params};
  for (const MotionRegion& g : r.regions) key.push_back({g.Name(), g.Left(), g.Top(), g.Right(), g.Bottom()});
  if (c.api.stream) key.push_back({"stream", c.api.stream->path, c.api.stream->port});
  for (const auto& [pair, l] : c.api.streams) key.push_back({pair.first, pair.second, l.path, l.port});
  if (c.frames) key.push_back({"frames", c.frames->path, c.frames->port});
  return key.dump();
}

bool SameDetector(const DetectorConfig& a, const DetectorConfig& b) {
  return a.cls == b.cls && a.inputs == b.inputs && a.function_group == b.function_group && a.type == b.type &&
         a.stream_buffer == b.stream_buffer;
}

// Runs each stop on its own thread, since each may wait for a pass in progress (network
// time-out included), and wakes the pacing timers until all have returned, so that none
// waits out a long interval first (a timer asleep before its flag was cleared would sleep on).
void StopAllAtOnce(const std::vector<std::function<void()>>& stops) {
  std::vector<std::thread> stoppers;
  for (const auto& stop : stops) {
    try {
      stoppers.emplace_back(stop);
    } catch (const std::system_error&) {
      stop();  // out of threads: this one stops in turn
    }
  }
  std::atomic<bool> stopped{false};
  std::thread waker([&stopped] {
    while (!stopped) {
      DelayTimer::WakeAll();
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
  });
  for (std::thread& t : stoppers) t.join();
  stopped = true;
  waker.join();
}

std::function<void()> StopDetector(Runner::DetectorUnit* u) {
  return [u] {
    if (u->detector) u->detector->Stop();
    u->detector.reset();
  };
}

}  // namespace

Runner::Runner(Config config, Sink& sink, std::ostream& log)
    : config_(std::move(config)), sink_(sink), log_(log) {}

Runner::~Runner() { Stop(); }

size_t Runner::DetectorCount() const {
  size_t n = 0;
  for (const auto& camera : cameras_) n += camera->detectors.size();
  return n;
}

bool Runner::Start(std::string* error) {
  std::vector<CameraUnit*> started;
  if (!StartCameras(config_.cameras, &started, error)) {
    Stop();
    return false;
  }
  return true;
}

bool Runner::StartCameras(const std::vector<CameraConfig>& configs, std::vector<CameraUnit*>* started,
                          std::string* error) {
  // Every camera's frame receiver first, so that they all connect at once.
  for (const CameraConfig& camera : configs) {
    CameraUnit* unit = StartCamera(camera, error);
    if (unit == nullptr) return false;
    started->push_back(unit);
  }
  WaitForFirstFrames(*started);
  for (CameraUnit* unit : *started) {
    for (const DetectorConfig& d : unit->config.detectors) {
      if (!StartDetector(d, unit, error)) return false;
    }
  }
  return true;
}

Runner::CameraUnit* Runner::StartCamera(const CameraConfig& config, std::string* error) {
  auto unit = std::make_unique<CameraUnit>();
  unit->config = config;
  unit->camera = std::make_unique<Camera>(config.record);
  unit->api = std::make_unique<CameraAPI>(config.api);
  if (config.frames) {
    const std::string where = config_.file + ": " + config.path + ".frames";
    unit->receiver = FrameReceiver::Create(*unit->camera, *config.frames);
    if (unit->receiver == nullptr) {
      *error = where + ": no memory for the camera's frame buffer";
      return nullptr;
    }
    if (!unit->receiver->SharedMemory()) {
      log_ << "evwatch: " << where << ": no shared memory for buffer "
           << unit->receiver->BufferId() << "; the frame buffer is private to this process"
           << std::endl;
    }
    if (!unit->receiver->Start()) {
      *error = where + ": cannot start the frame receiver";
      return nullptr;
    }
  }
  cameras_.push_back(std::move(unit));
  return cameras_.back().get();
}

void Runner::WaitForFirstFrames(const std::vector<CameraUnit*>& cameras) {
  const auto deadline = std::chrono::steady_clock::now() + kFirstFrameWait;
  for (CameraUnit* unit : cameras) {
    FrameReceiver* receiver = unit->receiver.get();
    if (receiver == nullptr || receiver->WaitForFrame(deadline)) continue;
    const CameraConfig& config = unit->config;
    log_ << "evwatch: " << config_.file << ": " << config.path << ".frames: no frame from "
         << config.record.host << ":" << config.frames->port << config.frames->path
         << " yet; its frame buffer starts empty" << std::endl;
  }
}

bool Runner::StartDetector(const DetectorConfig& d, CameraUnit* camera, std::string* error) {
  const CameraConfig& config = camera->config;
  const DetectorClass* info = FindDetectorClass(d.cls);
  if (info == nullptr) {  // the configuration was checked against this same registry
    *error = config_.file + ": " + d.path + ": unknown class " + d.cls;
    return false;
  }
  DetectorArgs args;
  args.camera = camera->camera.get();
  args.api = camera->api.get();
  args.stream_buffer = d.stream_buffer && camera->receiver ? camera->receiver->Buffer() : nullptr;
  args.inputs = d.inputs;
  args.function_group = d.function_group;
  args.type = d.type;

  DetectorKind kind = info->kind;
  if (kind == DetectorKind::kBoth) kind = d.type == 0 ? DetectorKind::kMotion : DetectorKind::kInput;
  if (kind == DetectorKind::kBothLevel) kind = d.type == 0 ? DetectorKind::kMotion : DetectorKind::kInputLevel;
  const int handle = sink_.Add(config.name, d.name, d.cls, kind);

  auto unit = std::make_unique<DetectorUnit>();
  unit->config = d;
  unit->interval = d.interval.value_or(config_.interval);
  unit->buffer = std::make_unique<EventBuf>();
  Sink* sink = &sink_;
  unit->buffer->AddObserver([sink, handle](const StatusReport& r) { sink->Report(handle, r); });
  unit->detector = info->make(args);
  const std::string where = config_.file + ": " + d.path + " (" + config.name + "/" + d.name + ")";
  if (!unit->detector) {
    *error = where + ": cannot create " + info->constructor;
    return false;
  }
  if (unit->detector->Init(unit->buffer.get(), unit->interval) != 0) {
    *error = where + ": Init failed";
    return false;
  }
  EventDetector* detector = unit->detector.get();
  camera->detectors.push_back(std::move(unit));
  if (detector->Start() != 0) {
    *error = where + ": Start failed";
    return false;
  }
  return true;
}

Runner::Change Runner::Apply(Config next, std::string* error) {
  Change change;
  std::vector<std::function<void()>> stops;
  std::vector<size_t> gone;                  // indexes into cameras_ of cameras that go
  std::vector<CameraConfig> new_cameras;     // to start whole
  std::vector<std::pair<CameraUnit*, DetectorConfig>> new_detectors;  // on kept cameras
  std::vector<std::pair<CameraUnit*, DetectorUnit*>> dropped;         // from kept cameras
  for (size_t i = 0; i < cameras_.size(); ++i) {
    CameraUnit* unit = cameras_[i].get();
    const CameraConfig* after = nullptr;
    for (const CameraConfig& c : next.cameras) {
      if (c.name == unit->config.name) after = &c;
    }
    if (after == nullptr || CameraKey(*after) != CameraKey(unit->config)) {
      gone.push_back(i);
      for (auto& d : unit->detectors) stops.push_back(StopDetector(d.get()));
      if (unit->receiver) stops.push_back([r = unit->receiver.get()] { r->Stop(); });
      change.stopped += unit->detectors.size();
      continue;
    }
    // The same camera: keep each detector whose entry and interval are unchanged.
    for (auto& d : unit->detectors) {
      bool kept = false;
      for (const DetectorConfig& e : after->detectors) {
        kept = kept || (e.name == d->config.name && SameDetector(e, d->config) &&
                        e.interval.value_or(next.interval) == d->interval);
      }
      if (kept) {
        ++change.kept;
      } else {
        stops.push_back(StopDetector(d.get()));
        dropped.emplace_back(unit, d.get());
        ++change.stopped;
      }
    }
    for (const DetectorConfig& e : after->detectors) {
      bool running = false;
      for (auto& d : unit->detectors) {
        running = running || (e.name == d->config.name && SameDetector(e, d->config) &&
                              e.interval.value_or(next.interval) == d->interval);
      }
      if (!running) new_detectors.emplace_back(unit, e);
    }
    unit->config = *after;  // paths in messages follow the new file
  }
  for (const CameraConfig& c : next.cameras) {
    bool known = false;
    for (size_t i = 0; i < cameras_.size(); ++i) {
      const bool going = std::find(gone.begin(), gone.end(), i) != gone.end();
      known = known || (cameras_[i]->config.name == c.name && !going);
    }
    if (!known) new_cameras.push_back(c);
  }

  StopAllAtOnce(stops);
  for (auto& [camera, detector] : dropped) {
    auto& list = camera->detectors;
    list.erase(std::remove_if(list.begin(), list.end(), [d = detector](const auto& u) { return u.get() == d; }),
               list.end());
  }
  for (auto it = gone.rbegin(); it != gone.rend(); ++it) cameras_.erase(cameras_.begin() + *it);

  config_ = std::move(next);
  for (auto& [camera, d] : new_detectors) {
    if (!StartDetector(d, camera, error)) return change;
    ++change.started;
  }
  std::vector<CameraUnit*> started;
  const bool ok = StartCameras(new_cameras, &started, error);
  for (CameraUnit* unit : started) change.started += unit->detectors.size();
  change.ok = ok;
  return change;
}

void Runner::Stop() {
  std::vector<std::function<void()>> stops;
  for (auto& camera : cameras_) {
    for (auto& d : camera->detectors) stops.push_back(StopDetector(d.get()));
  }
  // A receiver only writes into its buffer; the buffer itself goes with its camera, after
  // every detector that reads it.
  for (auto& camera : cameras_) {
    if (camera->receiver) stops.push_back([r = camera->receiver.get()] { r->Stop(); });
  }
  StopAllAtOnce(stops);
  cameras_.clear();
}

}  // namespace evwatch
