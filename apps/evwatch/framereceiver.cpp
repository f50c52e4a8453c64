#include "apps/evwatch/framereceiver.h"

#include <new>
#include <system_error>
#include <vector>

#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"

namespace evwatch {
namespace {

constexpr int kHeaderSize = 128;

}  // namespace

std::unique_ptr<FrameReceiver> FrameReceiver::Create(const Camera& camera, StreamLocation source) {
  std::unique_ptr<FrameReceiver> receiver(new FrameReceiver(camera, std::move(source)));
  receiver->buffer_ = StreamBuffer::CreateShared(receiver->buffer_id_, kSlots, kFrameCapacity);
  receiver->shared_ = receiver->buffer_ != nullptr;
  if (receiver->buffer_ == nullptr) {
    const size_t words = (StreamBuffer::RequiredBytes(kSlots, kFrameCapacity) + 7) / 8;
    receiver->heap_memory_.reset(new (std::nothrow) uint64_t[words]);
    if (receiver->heap_memory_ == nullptr) return nullptr;
    receiver->buffer_ = StreamBuffer::Format(receiver->heap_memory_.get(), kSlots, kFrameCapacity);
    if (receiver->buffer_ == nullptr) return nullptr;
  }
  return receiver;
}

FrameReceiver::FrameReceiver(const Camera& camera, StreamLocation source)
    : host_(camera.GetHost()),
      user_(camera.GetUsername()),
      password_(camera.GetPassword()),
      source_(std::move(source)),
      buffer_id_(camera.GetId() + kBufferIdOffset) {}

FrameReceiver::~FrameReceiver() {
  Stop();
  if (shared_) {
    StreamBuffer::DetachShared(buffer_);
    StreamBuffer::RemoveShared(buffer_id_);
  }
}

bool FrameReceiver::Start() {
  if (thread_.joinable()) return true;
  running_ = true;
  try {
    thread_ = std::thread(&FrameReceiver::Run, this);
  } catch (const std::system_error&) {
    running_ = false;
    return false;
  }
  return true;
}

void FrameReceiver::Stop() {
  running_ = false;
  if (thread_.joinable()) thread_.join();
}

bool FrameReceiver::WaitForFrame(std::chrono::steady_clock::time_point deadline) {
  std::unique_lock<std::mutex> lock(mutex_);
  return frame_cv_.wait_until(lock, deadline, [this] { return frames_.load() > 0; });
}

void FrameReceiver::Run() {
  // One reader for the whole run: after a failed read it reconnects by itself, at most
  // once a second.
  MultipartFetch fetch(host_.c_str(), source_.port, source_.path.c_str(), user_.c_str(),
                       password_.c_str(), kTimeout);
  std::vector<char> frame;  // grows to the largest frame kept
  char header[kHeaderSize];
  while (running_) {
    int length = 0;
    if (fetch.ReadPartHeader(&length, header, kHeaderSize) != 0) continue;
    if (length <= 0 || static_cast<uint32_t>(length) > kFrameCapacity) {
      fetch.SkipContent(nullptr, 0);
      continue;
    }
    if (frame.size() < static_cast<size_t>(length)) {
      try {
        frame.resize(length);
      } catch (const std::bad_alloc&) {
        fetch.SkipContent(nullptr, 0);
        continue;
      }
    }
    if (fetch.ReadPartBody(frame.data(), length) != 0) continue;
    // Dropped when every other slot is held by readers: a newer frame follows soon.
    if (buffer_->Write(frame.data(), static_cast<uint32_t>(length)) != 0) continue;
    if (frames_.fetch_add(1) == 0) {
      std::lock_guard<std::mutex> lock(mutex_);
      frame_cv_.notify_all();
    }
  }
}

}  // namespace evwatch
