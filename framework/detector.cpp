#include "framework/detector.h"

#include <cstdint>

DetectorBase::DetectorBase() : event_buffer_(nullptr), run_(false), interval_(500) {
  pthread_mutex_init(&mutex_, nullptr);
}

DetectorBase::~DetectorBase() {
  if (IsStarted() == 1) Stop();
  // The mutex may still be held by a thread leaving IsStarted(); wait for it before
  // destroying it.
  if (pthread_mutex_trylock(&mutex_) != 0) pthread_mutex_lock(&mutex_);
  pthread_mutex_unlock(&mutex_);
  pthread_mutex_destroy(&mutex_);
}

int DetectorBase::Init(EventBuf* buffer, int interval) {
  if (buffer == nullptr || interval <= 0) return -1;
  event_buffer_ = buffer;
  interval_ = interval;
  return 0;
}

int DetectorBase::Start() {
  if (event_buffer_ == nullptr || interval_ < 1) return -1;
  if (IsStarted()) return -2;
  pthread_mutex_lock(&mutex_);
  run_ = true;
  pthread_create(&thread_, nullptr, &DetectorBase::DetThreadFunc, this);
  pthread_mutex_unlock(&mutex_);
  return 0;
}

int DetectorBase::Stop() {
  if (IsStarted() == 0) return -2;
  pthread_mutex_lock(&mutex_);
  run_ = false;
  pthread_mutex_unlock(&mutex_);
  pthread_join(thread_, nullptr);
  return 0;
}

bool DetectorBase::IsStarted() {
  pthread_mutex_lock(&mutex_);
  bool running = run_;
  pthread_mutex_unlock(&mutex_);
  return running;
}

void* DetectorBase::DetThreadFunc(void* detector) {
  int result = static_cast<DetectorBase*>(detector)->EventDetecor();
  return reinterpret_cast<void*>(static_cast<intptr_t>(result));
}
