#include "framework/host/streambuffer.h"

#include <sys/ipc.h>
#include <sys/shm.h>

#include <climits>
#include <cstring>
#include <new>

// Processes that map the buffer synchronise through these atomics alone, so they must not
// fall back to a lock that lives in one process's memory.
static_assert(std::atomic<int32_t>::is_always_lock_free, "int32 atomics must be lock-free");
static_assert(std::atomic<uint32_t>::is_always_lock_free, "uint32 atomics must be lock-free");
static_assert(std::atomic<int64_t>::is_always_lock_free, "int64 atomics must be lock-free");
static_assert(std::atomic<uint64_t>::is_always_lock_free, "uint64 atomics must be lock-free");

struct StreamBuffer::SlotState {
  std::atomic<int32_t> holders;  // readers holding the slot, -1 while the writer fills it
  uint32_t unused;
  uint64_t sequence;  // full sequence of the unit; written only while holders is -1
};

namespace {

constexpr uint32_t kMagic = 0x42535745;  // "EWSB" in memory order
constexpr uint32_t kVersion = 1;
constexpr uint32_t kIpcKeyBase = 0x45570000;
constexpr size_t kStateBytes = 16;
constexpr size_t kSlotAlign = 64;
// A reader that keeps losing the newest slot to the writer gives up and sees no frame this
// pass rather than spin without bound.
constexpr int kMaxReadAttempts = 1000;

constexpr size_t RoundUp(size_t n, size_t align) { return (n + align - 1) / align * align; }

size_t StatesOffset() { return RoundUp(sizeof(StreamBuffer), kStateBytes); }

size_t SlotsOffset(uint32_t slots) { return RoundUp(StatesOffset() + slots * kStateBytes, kSlotAlign); }

uint64_t SlotStride(uint32_t capacity) {
  return RoundUp(uint64_t{DataUnit::kHeadSize} + capacity, kSlotAlign);
}

// Sequence of the unit that this thread last got from each buffer, so that ReadLatest can
// tell a new unit from the one its caller has seen. It stays in the reading process: the
// shared buffer holds no per-reader state. A buffer pushed out of the memo only makes its
// next unit count as new once.
class SeenMemo {
 public:
  const uint64_t* Find(const void* buffer) {
    for (Entry& entry : entries_) {
      if (entry.buffer == buffer) {
        entry.used = ++clock_;
        return &entry.sequence;
      }
    }
    return nullptr;
  }

  void Remember(const void* buffer, uint64_t sequence) {
    Entry* target = &entries_[0];
    for (Entry& entry : entries_) {
      if (entry.buffer == buffer) {
        target = &entry;
        break;
      }
      if (entry.used < target->used) target = &entry;
    }
    target->buffer = buffer;
    target->sequence = sequence;
    target->used = ++clock_;
  }

 private:
  struct Entry {
    const void* buffer = nullptr;
    uint64_t sequence = 0;
    uint64_t used = 0;  // clock_ value of the last use; the smallest is replaced first
  };
  static constexpr int kEntries = 16;

  Entry entries_[kEntries];
  uint64_t clock_ = 0;
};

thread_local SeenMemo seen_memo;

}  // namespace

key_t IPCKeyFromBufId(int id) {
  // Unsigned sum: ids near INT_MAX wrap instead of overflowing.
  return static_cast<key_t>(kIpcKeyBase + static_cast<uint32_t>(id));
}

size_t StreamBuffer::RequiredBytes(uint32_t slots, uint32_t capacity) {
  if (slots < 2 || slots > kMaxSlots) return 0;
  return SlotsOffset(slots) + slots * SlotStride(capacity);
}

StreamBuffer* StreamBuffer::Format(void* memory, uint32_t slots, uint32_t capacity) {
  static_assert(sizeof(SlotState) == kStateBytes, "slot state layout");
  if (memory == nullptr || reinterpret_cast<uintptr_t>(memory) % alignof(uint64_t) != 0) {
    return nullptr;
  }
  const size_t bytes = RequiredBytes(slots, capacity);
  if (bytes == 0) return nullptr;

  StreamBuffer* buffer = new (memory) StreamBuffer();
  buffer->magic_.store(0, std::memory_order_relaxed);
  buffer->version_ = kVersion;
  buffer->slots_ = slots;
  buffer->capacity_ = capacity;
  buffer->slot_stride_ = SlotStride(capacity);
  buffer->write_sequence_.store(0, std::memory_order_relaxed);
  buffer->latest_.store(-1, std::memory_order_relaxed);
  char* base = static_cast<char*>(memory);
  for (uint32_t i = 0; i < slots; ++i) {
    SlotState* state = new (base + StatesOffset() + i * kStateBytes) SlotState();
    state->holders.store(0, std::memory_order_relaxed);
  }
  std::memset(base + SlotsOffset(slots), 0, bytes - SlotsOffset(slots));
  buffer->magic_.store(kMagic, std::memory_order_release);
  return buffer;
}

StreamBuffer* StreamBuffer::CreateShared(int id, uint32_t slots, uint32_t capacity) {
  const size_t bytes = RequiredBytes(slots, capacity);
  if (bytes == 0) return nullptr;
  // A segment left by an earlier run may have another size or layout: start afresh.
  RemoveShared(id);
  const int shmid = shmget(IPCKeyFromBufId(id), bytes, IPC_CREAT | IPC_EXCL | 0600);
  if (shmid < 0) return nullptr;
  void* memory = shmat(shmid, nullptr, 0);
  if (memory == reinterpret_cast<void*>(-1)) {
    shmctl(shmid, IPC_RMID, nullptr);
    return nullptr;
  }
  StreamBuffer* buffer = Format(memory, slots, capacity);
  if (buffer == nullptr) {
    shmdt(memory);
    shmctl(shmid, IPC_RMID, nullptr);
  }
  return buffer;
}

StreamBuffer* StreamBuffer::AttachShared(int id) {
  const int shmid = shmget(IPCKeyFromBufId(id), 0, 0);
  if (shmid < 0) return nullptr;
  struct shmid_ds info;
  if (shmctl(shmid, IPC_STAT, &info) != 0 || info.shm_segsz < sizeof(StreamBuffer)) {
    return nullptr;
  }
  void* memory = shmat(shmid, nullptr, 0);
  if (memory == reinterpret_cast<void*>(-1)) return nullptr;
  StreamBuffer* buffer = static_cast<StreamBuffer*>(memory);
  // The header's sizes must describe memory that the segment really has.
  if (!buffer->Valid() || RequiredBytes(buffer->slots_, buffer->capacity_) > info.shm_segsz) {
    shmdt(memory);
    return nullptr;
  }
  return buffer;
}

void StreamBuffer::DetachShared(StreamBuffer* buffer) {
  if (buffer != nullptr) shmdt(buffer);
}

void StreamBuffer::RemoveShared(int id) {
  const int shmid = shmget(IPCKeyFromBufId(id), 0, 0);
  if (shmid >= 0) shmctl(shmid, IPC_RMID, nullptr);
}

bool StreamBuffer::Valid() const {
  return magic_.load(std::memory_order_acquire) == kMagic && version_ == kVersion &&
         slots_ >= 2 && slots_ <= kMaxSlots && slot_stride_ == SlotStride(capacity_);
}

StreamBuffer::SlotState* StreamBuffer::States() {
  return reinterpret_cast<SlotState*>(reinterpret_cast<char*>(this) + StatesOffset());
}

DataUnit* StreamBuffer::Slot(uint32_t index) {
  char* slots = reinterpret_cast<char*>(this) + SlotsOffset(slots_);
  return reinterpret_cast<DataUnit*>(slots + index * slot_stride_);
}

int64_t StreamBuffer::IndexOf(const DataUnit* unit) {
  const uintptr_t first = reinterpret_cast<uintptr_t>(Slot(0));
  const uintptr_t at = reinterpret_cast<uintptr_t>(unit);
  if (at < first || (at - first) % slot_stride_ != 0) return -1;
  const uint64_t index = (at - first) / slot_stride_;
  return index < slots_ ? static_cast<int64_t>(index) : -1;
}

bool StreamBuffer::TryHold(uint32_t index) {
  std::atomic<int32_t>& holders = States()[index].holders;
  int32_t count = holders.load(std::memory_order_relaxed);
  while (count >= 0 && count < INT32_MAX) {
    if (holders.compare_exchange_weak(count, count + 1, std::memory_order_acq_rel,
                                      std::memory_order_relaxed)) {
      return true;
    }
  }
  return false;
}

void StreamBuffer::Release(uint32_t index) {
  std::atomic<int32_t>& holders = States()[index].holders;
  int32_t count = holders.load(std::memory_order_relaxed);
  // A release without a hold must not turn a reader's count into the writer's mark.
  while (count > 0) {
    if (holders.compare_exchange_weak(count, count - 1, std::memory_order_acq_rel,
                                      std::memory_order_relaxed)) {
      return;
    }
  }
}

DataUnit* StreamBuffer::ReadLatest(DataUnit* previous) {
  if (!Valid()) return nullptr;
  for (int attempt = 0; attempt < kMaxReadAttempts; ++attempt) {
    const int64_t index = latest_.load(std::memory_order_acquire);
    if (index < 0 || index >= slots_) return nullptr;
    if (!TryHold(static_cast<uint32_t>(index))) continue;
    // The writer never takes the newest slot, but it may have published another one and
    // taken this one between our two looks: hold only a slot that is still the newest.
    if (latest_.load(std::memory_order_acquire) != index) {
      Release(static_cast<uint32_t>(index));
      continue;
    }
    const uint64_t sequence = States()[index].sequence;
    const uint64_t* seen = seen_memo.Find(this);
    if (previous != nullptr && seen != nullptr && *seen == sequence) {
      Release(static_cast<uint32_t>(index));
      return nullptr;
    }
    seen_memo.Remember(this, sequence);
    return Slot(static_cast<uint32_t>(index));
  }
  return nullptr;
}

void StreamBuffer::ReadFinish(DataUnit* unit, bool /*reuse*/) {
  if (unit == nullptr || !Valid()) return;
  const int64_t index = IndexOf(unit);
  if (index >= 0) Release(static_cast<uint32_t>(index));
}

int StreamBuffer::Write(const char* frame, uint32_t length, uint32_t skip) {
  if (!Valid() || uint64_t{length} + skip > capacity_) return -1;
  if (frame == nullptr && length > 0) return -1;
  const int64_t newest = latest_.load(std::memory_order_relaxed);
  const uint32_t start = newest < 0 ? 0 : static_cast<uint32_t>((newest + 1) % slots_);
  for (uint32_t step = 0; step < slots_; ++step) {
    const uint32_t index = (start + step) % slots_;
    if (index == newest) continue;
    SlotState& state = States()[index];
    int32_t free_mark = 0;
    if (!state.holders.compare_exchange_strong(free_mark, -1, std::memory_order_acq_rel,
                                               std::memory_order_relaxed)) {
      continue;
    }
    const uint64_t sequence = write_sequence_.load(std::memory_order_relaxed) + 1;
    state.sequence = sequence;
    DataUnit* unit = Slot(index);
    unit->sequence = static_cast<uint32_t>(sequence);
    unit->length = skip + length;
    unit->skip = skip;
    std::memset(unit->reserved, 0, sizeof(unit->reserved));
    char* data = reinterpret_cast<char*>(unit) + DataUnit::kHeadSize;
    std::memset(data, 0, skip);
    if (length > 0) std::memcpy(data + skip, frame, length);
    state.holders.store(0, std::memory_order_release);
    latest_.store(index, std::memory_order_release);
    write_sequence_.store(sequence, std::memory_order_release);
    return 0;
  }
  return -1;
}
