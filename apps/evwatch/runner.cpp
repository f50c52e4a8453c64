#include "apps/evwatch/runner.h"

#include <atomic>
#include <chrono>
#include <functional>
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

struct Runner::CameraUnit {
  std::unique_ptr<Camera> camera;
  std::unique_ptr<CameraAPI> api;
  std::unique_ptr<FrameReceiver> receiver;  // fills the frame buffer; null without frames:
};

struct Runner::DetectorUnit {
  std::unique_ptr<EventBuf> buffer;
  // Declared after buffer so that it is destroyed (stopped) first.
  std::unique_ptr<EventDetector> detector;
};

Runner::Runner(Config config, Sink& sink, std::ostream& log)
    : config_(std::move(config)), sink_(sink), log_(log) {}

Runner::~Runner() { Stop(); }

bool Runner::Start(std::string* error) {
  // Every camera's frame receiver first, so that they all connect at once.
  for (const CameraConfig& camera : config_.cameras) {
    if (!StartCamera(camera, error)) {
      Stop();
      return false;
    }
  }
  WaitForFirstFrames();
  for (size_t i = 0; i < config_.cameras.size(); ++i) {
    if (!StartDetectors(config_.cameras[i], cameras_[i].get(), error)) {
      Stop();
      return false;
    }
  }
  return true;
}

bool Runner::StartCamera(const CameraConfig& config, std::string* error) {
  auto unit = std::make_unique<CameraUnit>();
  unit->camera = std::make_unique<Camera>(config.record);
  unit->api = std::make_unique<CameraAPI>(config.api);
  if (config.frames) {
    const std::string where = config_.file + ": " + config.path + ".frames";
    unit->receiver = FrameReceiver::Create(*unit->camera, *config.frames);
    if (unit->receiver == nullptr) {
      *error = where + ": no memory for the camera's frame buffer";
      return false;
    }
    if (!unit->receiver->SharedMemory()) {
      log_ << "evwatch: " << where << ": no shared memory for buffer "
           << unit->receiver->BufferId() << "; the frame buffer is private to this process"
           << std::endl;
    }
    if (!unit->receiver->Start()) {
      *error = where + ": cannot start the frame receiver";
      return false;
    }
  }
  cameras_.push_back(std::move(unit));
  return true;
}

void Runner::WaitForFirstFrames() {
  const auto deadline = std::chrono::steady_clock::now() + kFirstFrameWait;
  for (size_t i = 0; i < cameras_.size(); ++i) {
    FrameReceiver* receiver = cameras_[i]->receiver.get();
    if (receiver == nullptr || receiver->WaitForFrame(deadline)) continue;
    const CameraConfig& config = config_.cameras[i];
    log_ << "evwatch: " << config_.file << ": " << config.path << ".frames: no frame from "
         << config.record.host << ":" << config.frames->port << config.frames->path
         << " yet; its frame buffer starts empty" << std::endl;
  }
}

bool Runner::StartDetectors(const CameraConfig& config, CameraUnit* camera, std::string* error) {
  for (const DetectorConfig& d : config.detectors) {
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
    unit->buffer = std::make_unique<EventBuf>();
    Sink* sink = &sink_;
    unit->buffer->AddObserver([sink, handle](const StatusReport& r) { sink->Report(handle, r); });
    unit->detector = info->make(args);
    const std::string where = config_.file + ": " + d.path + " (" + config.name + "/" + d.name + ")";
    if (!unit->detector) {
      *error = where + ": cannot create " + info->constructor;
      return false;
    }
    if (unit->detector->Init(unit->buffer.get(), d.interval.value_or(config_.interval)) != 0) {
      *error = where + ": Init failed";
      return false;
    }
    EventDetector* detector = unit->detector.get();
    detectors_.push_back(std::move(unit));
    if (detector->Start() != 0) {
      *error = where + ": Start failed";
      return false;
    }
  }
  return true;
}

void Runner::Stop() {
  // Each stop may wait for its detector's pass in progress, network time-out included, so
  // they all run at once and the whole stop takes as long as the slowest one.
  std::vector<std::thread> stoppers;
  auto run = [&stoppers](std::function<void()> stop) {
    try {
      stoppers.emplace_back(stop);
    } catch (const std::system_error&) {
      stop();  // out of threads: this one stops in turn
    }
  };
  for (auto& unit : detectors_) {
    run([u = unit.get()] {
      if (u->detector) u->detector->Stop();
      u->detector.reset();
    });
  }
  // A receiver only writes into its buffer; the buffer itself goes with its camera, after
  // every detector that reads it.
  for (auto& camera : cameras_) {
    if (camera->receiver) run([r = camera->receiver.get()] { r->Stop(); });
  }
  // A detector sees its cleared run flag at the top of its next pass; wake the pacing timers
  // until every stop has returned, so that none waits out a long interval first (a timer
  // asleep before its flag was cleared would sleep on).
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
  detectors_.clear();
  cameras_.clear();
}

}  // namespace evwatch
