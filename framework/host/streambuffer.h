// Frame buffer of one camera: a ring of frame records that a receiver writes and detectors
// read, in process memory or in System V shared memory so that another process can attach
// it (shmget(IPCKeyFromBufId(id), 0, 0) + shmat, then use the address as a StreamBuffer*).
//
// The object is its own shared-memory layout: a fixed header followed by the slots. It holds
// no pointers and no process-local state, so every process that maps it can use it.
//
// Record layout of a DataUnit (what a slot holds): three 32-bit words, the second the data
// length and the third a leading-skip count, then the rest of an 88-byte record head; the
// frame bytes start 88 + skip bytes after the record, and the frame length is the data
// length minus the skip count.
//
// Threads and processes: one writer and any number of readers at once. A reader's unit stays
// intact from ReadLatest() until its ReadFinish(); the writer never overwrites a unit that a
// reader holds (it drops a frame instead when every other slot is held).

#ifndef EVWATCH_FRAMEWORK_HOST_STREAMBUFFER_H_
#define EVWATCH_FRAMEWORK_HOST_STREAMBUFFER_H_

#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>

// Key of the shared-memory segment of buffer `id` (the detectors pass camera id + 524288):
// 0x45570000 + id, so our segments stay clear of small keys that other programs pick.
key_t IPCKeyFromBufId(int id);

struct DataUnit {
  static constexpr uint32_t kHeadSize = 88;

  uint32_t sequence;  // low 32 bits of the write sequence number
  uint32_t length;    // data length: skip + frame bytes
  uint32_t skip;      // leading bytes before the frame
  uint32_t reserved[(kHeadSize - 12) / 4];

  // The frame bytes, kHeadSize + skip after the record, and their count.
  const char* Frame() const { return reinterpret_cast<const char*>(this) + kHeadSize + skip; }
  uint32_t FrameLength() const { return length - skip; }
};
static_assert(sizeof(DataUnit) == DataUnit::kHeadSize, "DataUnit head must be 88 bytes");

class StreamBuffer {
 public:
  static constexpr uint32_t kMaxSlots = 4096;

  // The object is its memory: it is never copied, only formatted in place or attached.
  StreamBuffer(const StreamBuffer&) = delete;
  StreamBuffer& operator=(const StreamBuffer&) = delete;

  // Bytes needed for a buffer of `slots` slots holding up to `capacity` data bytes each;
  // 0 when `slots` is outside [2, kMaxSlots].
  static size_t RequiredBytes(uint32_t slots, uint32_t capacity);

  // Makes a buffer in `memory` (at least RequiredBytes, 8-byte aligned) and returns it;
  // null when the memory is misaligned or `slots` is out of range. The caller keeps the
  // memory alive as long as the buffer is used.
  static StreamBuffer* Format(void* memory, uint32_t slots, uint32_t capacity);

  // Creates (replacing any old one) the shared-memory buffer of `id`, mode 0600, and
  // attaches it. Null on failure. Release with DetachShared(); RemoveShared(id) deletes
  // the segment (it goes once the last process has detached).
  static StreamBuffer* CreateShared(int id, uint32_t slots, uint32_t capacity);
  // Attaches an existing shared-memory buffer of `id`; null when there is none or when
  // the segment does not hold a formatted buffer of its size.
  static StreamBuffer* AttachShared(int id);
  static void DetachShared(StreamBuffer* buffer);
  static void RemoveShared(int id);

  // Reader side. Returns the newest unit, or null when there is none or when it is the
  // same unit that this thread's previous ReadLatest on this buffer returned. `previous` is
  // the unit of the reader's previous pass: null on a reader's first pass, which makes any
  // newest unit count as new. REQUIRES: a returned unit is released with ReadFinish in the
  // same pass, by the same thread.
  DataUnit* ReadLatest(DataUnit* previous);
  // Releases a unit that ReadLatest returned. `reuse` is accepted for the interface and
  // has no effect here.
  void ReadFinish(DataUnit* unit, bool reuse);

  // Writer side. Copies `length` frame bytes, after `skip` filler bytes, into a free slot
  // and publishes it as the newest unit. Returns 0, or -1 when the frame does not fit a slot
  // or every other slot is held by readers (the frame is dropped).
  int Write(const char* frame, uint32_t length, uint32_t skip = 0);

  // Whether this memory holds a formatted buffer (checked by the readers).
  bool Valid() const;
  uint32_t SlotCapacity() const { return capacity_; }
  uint32_t SlotCount() const { return slots_; }

 private:
  struct SlotState;  // per-slot holder count and full sequence; defined with the code

  StreamBuffer() = default;
  SlotState* States();
  DataUnit* Slot(uint32_t index);
  // Slot index of a unit inside this buffer, or -1 when `unit` is not a slot's record.
  int64_t IndexOf(const DataUnit* unit);
  bool TryHold(uint32_t index);
  void Release(uint32_t index);

  std::atomic<uint32_t> magic_;  // kMagic once Format has finished (stored last, release)
  uint32_t version_;             // layout version; a reader rejects any other
  uint32_t slots_;               // number of slots, at least 2 (the newest is never rewritten)
  uint32_t capacity_;            // data bytes (skip + frame) that one slot can hold
  uint64_t slot_stride_;         // bytes from one slot's record to the next
  std::atomic<uint64_t> write_sequence_;  // sequence number of the newest published unit
  std::atomic<int64_t> latest_;           // slot index of the newest unit, -1 when none
  // Followed by slots_ SlotStates (holders: readers holding the slot, or -1 while the
  // writer fills it; the slot's 64-bit sequence) and then by the slots themselves.
};

#endif  // EVWATCH_FRAMEWORK_HOST_STREAMBUFFER_H_
