// Frame reception of one camera: the camera's frame buffer and the one thread that fills it
// from the camera's multipart stream (its `frames:` source), part by part, however many
// detectors read the buffer.
//
// The buffer lives in System V shared memory under the key of buffer id camera id +
// kBufferIdOffset (IPCKeyFromBufId), where a detector may attach it by key as well as take
// the pointer. When shared memory cannot be had, the buffer falls back to process memory
// (SharedMemory() then says so): detectors handed the pointer still work.
//
// Threads: Create, Start, Stop, WaitForFrame and the destructor from one thread (the
// runner's); the receiver's thread is the buffer's only writer. Buffer() stays valid until
// the receiver is destroyed, so every detector that reads it must be gone by then.

#ifndef EVWATCH_APPS_EVWATCH_FRAMERECEIVER_H_
#define EVWATCH_APPS_EVWATCH_FRAMERECEIVER_H_

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"

class StreamBuffer;

namespace evwatch {

class FrameReceiver {
 public:
  // Buffer id of a camera's frame buffer: camera id + this.
  static constexpr int kBufferIdOffset = 524288;
  static constexpr uint32_t kSlots = 4;
  // Largest frame kept; a longer part is passed over.
  static constexpr uint32_t kFrameCapacity = 2u << 20;
  // Seconds a silent stream may hold a read (and so Stop).
  static constexpr int kTimeout = 5;

  // Makes the buffer of `camera` for frames from `source` (not yet started). Null when no
  // buffer could be made at all.
  static std::unique_ptr<FrameReceiver> Create(const Camera& camera, StreamLocation source);
  FrameReceiver(const FrameReceiver&) = delete;
  FrameReceiver& operator=(const FrameReceiver&) = delete;
  // Stops, then releases the buffer (a shared segment is removed).
  ~FrameReceiver();

  // Starts the thread. False when it could not be created.
  bool Start();
  // Ends the thread; returns once it has ended (at most one read time-out). Idempotent.
  void Stop();
  // Waits until a frame has been written or `deadline` passes; true when one has.
  bool WaitForFrame(std::chrono::steady_clock::time_point deadline);

  StreamBuffer* Buffer() const { return buffer_; }
  int BufferId() const { return buffer_id_; }
  bool SharedMemory() const { return shared_; }
  // Frames written into the buffer so far.
  uint64_t Frames() const { return frames_.load(); }

 private:
  FrameReceiver(const Camera& camera, StreamLocation source);
  void Run();

  const std::string host_, user_, password_;
  const StreamLocation source_;
  int buffer_id_;                            // camera id + kBufferIdOffset
  StreamBuffer* buffer_ = nullptr;           // shared segment or in heap_memory_
  bool shared_ = false;                      // buffer_ is an attached shared segment
  std::unique_ptr<uint64_t[]> heap_memory_;  // backs buffer_ when not shared
  std::thread thread_;
  std::atomic<bool> running_{false};
  std::atomic<uint64_t> frames_{0};
  std::mutex mutex_;
  std::condition_variable frame_cv_;  // signalled (under mutex_) on the first frame
};

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_FRAMERECEIVER_H_
