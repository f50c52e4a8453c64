#include "framework/host/streambuffer.h"

#include <poll.h>
#include <signal.h>
#include <sys/ipc.h>
#include <sys/shm.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace {

// A buffer in process memory, formatted on construction.
class LocalBuffer {
 public:
  LocalBuffer(uint32_t slots, uint32_t capacity)
      : memory_(StreamBuffer::RequiredBytes(slots, capacity) / sizeof(uint64_t) + 1),
        buffer_(StreamBuffer::Format(memory_.data(), slots, capacity)) {}

  StreamBuffer* get() { return buffer_; }
  StreamBuffer* operator->() { return buffer_; }

 private:
  std::vector<uint64_t> memory_;
  StreamBuffer* buffer_;
};

// Frame number n has a length, a skip count and bytes that all follow from n, so a reader
// can tell a torn or mixed-up unit from a whole one.
uint32_t FrameLen(uint64_t n) { return 8 + static_cast<uint32_t>((n * 37) % 300); }
uint32_t FrameSkip(uint64_t n) { return static_cast<uint32_t>(n % 5); }

std::vector<char> MakeFrame(uint64_t n) {
  std::vector<char> frame(FrameLen(n));
  std::memcpy(frame.data(), &n, sizeof(n));
  for (size_t i = sizeof(n); i < frame.size(); ++i) frame[i] = static_cast<char>(n * 131 + i);
  return frame;
}

int WriteNumbered(StreamBuffer* buffer, uint64_t n) {
  std::vector<char> frame = MakeFrame(n);
  return buffer->Write(frame.data(), static_cast<uint32_t>(frame.size()), FrameSkip(n));
}

// The frame number of a unit whose whole record is consistent with it, else 0.
uint64_t CheckedNumber(const DataUnit* unit) {
  if (unit->FrameLength() < sizeof(uint64_t) || unit->length < unit->skip) return 0;
  uint64_t n = 0;
  std::memcpy(&n, unit->Frame(), sizeof(n));
  if (n == 0 || unit->FrameLength() != FrameLen(n) || unit->skip != FrameSkip(n)) return 0;
  const char* head = reinterpret_cast<const char*>(unit) + DataUnit::kHeadSize;
  for (uint32_t i = 0; i < unit->skip; ++i) {
    if (head[i] != 0) return 0;
  }
  std::vector<char> expected = MakeFrame(n);
  if (std::memcmp(unit->Frame(), expected.data(), expected.size()) != 0) return 0;
  return n;
}

// Buffer ids that no other test process uses at the same time.
int UniqueId(int k) { return 0x1000000 + static_cast<int>(getpid()) * 8 + k; }

class SegmentGuard {
 public:
  explicit SegmentGuard(int id) : id_(id) {}
  ~SegmentGuard() { StreamBuffer::RemoveShared(id_); }
  SegmentGuard(const SegmentGuard&) = delete;
  SegmentGuard& operator=(const SegmentGuard&) = delete;

 private:
  const int id_;
};

// Kills and reaps a child that the test did not reap itself.
class ChildGuard {
 public:
  explicit ChildGuard(pid_t pid) : pid_(pid) {}
  ~ChildGuard() {
    if (pid_ > 0) {
      kill(pid_, SIGKILL);
      waitpid(pid_, nullptr, 0);
    }
  }
  ChildGuard(const ChildGuard&) = delete;
  ChildGuard& operator=(const ChildGuard&) = delete;

  // Waits for the child; its exit status, or -1 when it did not exit normally.
  int Reap() {
    int status = 0;
    const pid_t done = waitpid(pid_, &status, 0);
    pid_ = -1;
    return done > 0 && WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

 private:
  pid_t pid_;
};

class FdGuard {
 public:
  FdGuard() { fds_[0] = fds_[1] = -1; }
  ~FdGuard() {
    CloseRead();
    CloseWrite();
  }
  FdGuard(const FdGuard&) = delete;
  FdGuard& operator=(const FdGuard&) = delete;

  bool Open() { return pipe(fds_) == 0; }
  int read_end() const { return fds_[0]; }
  int write_end() const { return fds_[1]; }
  void CloseRead() { CloseOne(0); }
  void CloseWrite() { CloseOne(1); }

 private:
  void CloseOne(int i) {
    if (fds_[i] >= 0) close(fds_[i]);
    fds_[i] = -1;
  }
  int fds_[2];
};

// Reads exactly `size` bytes, giving up after `seconds` without progress.
bool ReadFully(int fd, void* out, size_t size, int seconds) {
  char* at = static_cast<char*>(out);
  while (size > 0) {
    pollfd p{fd, POLLIN, 0};
    if (poll(&p, 1, seconds * 1000) <= 0) return false;
    const ssize_t got = read(fd, at, size);
    if (got <= 0) return false;
    at += got;
    size -= static_cast<size_t>(got);
  }
  return true;
}

TEST(StreamBufferTest, UnitRecordLayout) {
  LocalBuffer buffer(3, 64);
  ASSERT_NE(buffer.get(), nullptr);
  ASSERT_TRUE(buffer->Valid());
  EXPECT_EQ(buffer->SlotCount(), 3u);
  EXPECT_EQ(buffer->SlotCapacity(), 64u);

  const char frame[] = "JPEGDATA";
  ASSERT_EQ(buffer->Write(frame, 8, 5), 0);
  DataUnit* unit = buffer->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);

  const uint32_t* words = reinterpret_cast<const uint32_t*>(unit);
  EXPECT_EQ(words[0], 1u);   // first write sequence
  EXPECT_EQ(words[1], 13u);  // skip + frame
  EXPECT_EQ(words[2], 5u);   // skip
  EXPECT_EQ(unit->FrameLength(), 8u);
  const char* record = reinterpret_cast<const char*>(unit);
  EXPECT_EQ(unit->Frame(), record + 88 + 5);
  EXPECT_EQ(std::string(record + 93, 8), "JPEGDATA");
  EXPECT_EQ(std::string(record + 88, 5), std::string(5, '\0'));
  buffer->ReadFinish(unit, false);
}

TEST(StreamBufferTest, SequenceCountsWrites) {
  LocalBuffer buffer(3, 16);
  for (int i = 0; i < 5; ++i) ASSERT_EQ(buffer->Write("x", 1), 0);
  DataUnit* unit = buffer->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  EXPECT_EQ(unit->sequence, 5u);
  EXPECT_EQ(std::string(unit->Frame(), unit->FrameLength()), "x");
  buffer->ReadFinish(unit, false);
}

TEST(StreamBufferTest, EmptyBufferHasNoUnit) {
  LocalBuffer buffer(2, 16);
  ASSERT_NE(buffer.get(), nullptr);
  EXPECT_EQ(buffer->ReadLatest(nullptr), nullptr);
}

TEST(StreamBufferTest, FormatRejectsBadArguments) {
  EXPECT_EQ(StreamBuffer::RequiredBytes(1, 100), 0u);
  EXPECT_EQ(StreamBuffer::RequiredBytes(StreamBuffer::kMaxSlots + 1, 100), 0u);
  EXPECT_GE(StreamBuffer::RequiredBytes(2, 100), 2u * (88 + 100));

  std::vector<uint64_t> memory(StreamBuffer::RequiredBytes(4, 100) / 8 + 2);
  EXPECT_EQ(StreamBuffer::Format(memory.data(), 1, 100), nullptr);
  EXPECT_EQ(StreamBuffer::Format(nullptr, 4, 100), nullptr);
  EXPECT_EQ(StreamBuffer::Format(reinterpret_cast<char*>(memory.data()) + 4, 4, 100), nullptr);
  EXPECT_NE(StreamBuffer::Format(memory.data(), 4, 100), nullptr);
}

TEST(StreamBufferTest, UnformattedMemoryIsNotABuffer) {
  std::vector<uint64_t> memory(StreamBuffer::RequiredBytes(4, 100) / 8 + 1, 0);
  StreamBuffer* buffer = reinterpret_cast<StreamBuffer*>(memory.data());
  EXPECT_FALSE(buffer->Valid());
  EXPECT_EQ(buffer->ReadLatest(nullptr), nullptr);
  EXPECT_EQ(buffer->Write("abc", 3), -1);

  std::memset(memory.data(), 0x5a, memory.size() * sizeof(uint64_t));
  EXPECT_FALSE(buffer->Valid());
  EXPECT_EQ(buffer->ReadLatest(nullptr), nullptr);
}

TEST(StreamBufferTest, ReadLatestGivesNewestUnit) {
  LocalBuffer buffer(4, 512);
  for (uint64_t n = 1; n <= 3; ++n) ASSERT_EQ(WriteNumbered(buffer.get(), n), 0);
  DataUnit* unit = buffer->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  EXPECT_EQ(CheckedNumber(unit), 3u);
  EXPECT_EQ(unit->sequence, 3u);
  buffer->ReadFinish(unit, false);
}

TEST(StreamBufferTest, SameUnitIsNotGivenTwice) {
  LocalBuffer buffer(4, 512);
  ASSERT_EQ(WriteNumbered(buffer.get(), 1), 0);

  DataUnit* first = buffer->ReadLatest(nullptr);
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(CheckedNumber(first), 1u);
  buffer->ReadFinish(first, false);

  EXPECT_EQ(buffer->ReadLatest(first), nullptr);
  EXPECT_EQ(buffer->ReadLatest(first), nullptr);

  ASSERT_EQ(WriteNumbered(buffer.get(), 2), 0);
  DataUnit* second = buffer->ReadLatest(first);
  ASSERT_NE(second, nullptr);
  EXPECT_EQ(CheckedNumber(second), 2u);
  buffer->ReadFinish(second, false);
  EXPECT_EQ(buffer->ReadLatest(second), nullptr);

  // A first pass (no previous unit) takes whatever is newest, seen or not.
  DataUnit* again = buffer->ReadLatest(nullptr);
  ASSERT_NE(again, nullptr);
  EXPECT_EQ(CheckedNumber(again), 2u);
  buffer->ReadFinish(again, false);
}

TEST(StreamBufferTest, SeenUnitIsTrackedPerBuffer) {
  LocalBuffer a(3, 512);
  LocalBuffer b(3, 512);
  ASSERT_EQ(WriteNumbered(a.get(), 7), 0);
  ASSERT_EQ(WriteNumbered(b.get(), 9), 0);

  DataUnit* from_a = a->ReadLatest(nullptr);
  ASSERT_NE(from_a, nullptr);
  a->ReadFinish(from_a, false);
  DataUnit* from_b = b->ReadLatest(nullptr);
  ASSERT_NE(from_b, nullptr);
  EXPECT_EQ(CheckedNumber(from_b), 9u);
  b->ReadFinish(from_b, false);

  // Both units carry sequence 1; having read b must not hide a's unit or the reverse.
  EXPECT_EQ(a->ReadLatest(from_a), nullptr);
  EXPECT_EQ(b->ReadLatest(from_b), nullptr);
  ASSERT_EQ(WriteNumbered(a.get(), 8), 0);
  DataUnit* next_a = a->ReadLatest(from_a);
  ASSERT_NE(next_a, nullptr);
  EXPECT_EQ(CheckedNumber(next_a), 8u);
  a->ReadFinish(next_a, false);
  EXPECT_EQ(b->ReadLatest(from_b), nullptr);
}

TEST(StreamBufferTest, SeenUnitIsTrackedPerThread) {
  LocalBuffer buffer(3, 512);
  ASSERT_EQ(WriteNumbered(buffer.get(), 4), 0);
  DataUnit* mine = buffer->ReadLatest(nullptr);
  ASSERT_NE(mine, nullptr);
  buffer->ReadFinish(mine, false);
  ASSERT_EQ(buffer->ReadLatest(mine), nullptr);

  uint64_t other_saw = 0;
  std::thread other([&] {
    DataUnit* unit = buffer->ReadLatest(mine);
    if (unit != nullptr) {
      other_saw = CheckedNumber(unit);
      buffer->ReadFinish(unit, false);
    }
  });
  other.join();
  EXPECT_EQ(other_saw, 4u);
}

TEST(StreamBufferTest, HeldUnitIsNeverOverwritten) {
  LocalBuffer buffer(3, 512);
  ASSERT_EQ(WriteNumbered(buffer.get(), 1), 0);
  DataUnit* held = buffer->ReadLatest(nullptr);
  ASSERT_NE(held, nullptr);

  // One slot is newest, one is held: the third takes every write.
  for (uint64_t n = 2; n <= 100; ++n) ASSERT_EQ(WriteNumbered(buffer.get(), n), 0) << n;
  EXPECT_EQ(CheckedNumber(held), 1u);
  EXPECT_EQ(held->sequence, 1u);
  buffer->ReadFinish(held, false);

  DataUnit* newest = buffer->ReadLatest(held);
  ASSERT_NE(newest, nullptr);
  EXPECT_NE(newest, held);
  EXPECT_EQ(CheckedNumber(newest), 100u);
  buffer->ReadFinish(newest, false);
}

TEST(StreamBufferTest, WriteDropsFrameWhenEveryOtherSlotIsHeld) {
  LocalBuffer buffer(3, 512);
  ASSERT_EQ(WriteNumbered(buffer.get(), 1), 0);
  DataUnit* first = buffer->ReadLatest(nullptr);
  ASSERT_NE(first, nullptr);
  ASSERT_EQ(WriteNumbered(buffer.get(), 2), 0);
  DataUnit* second = buffer->ReadLatest(nullptr);
  ASSERT_NE(second, nullptr);
  ASSERT_NE(first, second);

  ASSERT_EQ(WriteNumbered(buffer.get(), 3), 0);
  EXPECT_EQ(WriteNumbered(buffer.get(), 4), -1);
  EXPECT_EQ(WriteNumbered(buffer.get(), 5), -1);
  EXPECT_EQ(CheckedNumber(first), 1u);
  EXPECT_EQ(CheckedNumber(second), 2u);

  DataUnit* newest = buffer->ReadLatest(nullptr);
  ASSERT_NE(newest, nullptr);
  EXPECT_EQ(CheckedNumber(newest), 3u);
  buffer->ReadFinish(newest, false);

  buffer->ReadFinish(first, false);
  ASSERT_EQ(WriteNumbered(buffer.get(), 6), 0);
  EXPECT_EQ(CheckedNumber(second), 2u);
  newest = buffer->ReadLatest(nullptr);
  ASSERT_NE(newest, nullptr);
  EXPECT_EQ(CheckedNumber(newest), 6u);
  EXPECT_EQ(newest->sequence, 4u);  // the dropped frames took no sequence number
  buffer->ReadFinish(newest, false);
  buffer->ReadFinish(second, false);
}

TEST(StreamBufferTest, ReleaseOfForeignUnitIsIgnored) {
  LocalBuffer buffer(2, 64);
  ASSERT_EQ(buffer->Write("a", 1), 0);
  DataUnit* held = buffer->ReadLatest(nullptr);
  ASSERT_NE(held, nullptr);
  DataUnit stray{};
  buffer->ReadFinish(&stray, false);
  buffer->ReadFinish(nullptr, false);
  buffer->ReadFinish(reinterpret_cast<DataUnit*>(reinterpret_cast<char*>(held) + 8), false);

  // The held slot is still held (and the other is newest), so the write must be dropped.
  ASSERT_EQ(buffer->Write("b", 1), 0);
  EXPECT_EQ(buffer->Write("c", 1), -1);
  buffer->ReadFinish(held, false);
  EXPECT_EQ(buffer->Write("d", 1), 0);
}

TEST(StreamBufferTest, OversizeFrameIsRefused) {
  LocalBuffer buffer(3, 100);
  std::vector<char> frame(101, 'z');
  EXPECT_EQ(buffer->Write(frame.data(), 101), -1);
  EXPECT_EQ(buffer->Write(frame.data(), 96, 5), -1);
  EXPECT_EQ(buffer->Write(frame.data(), 1, 0xFFFFFFFFu), -1);
  EXPECT_EQ(buffer->ReadLatest(nullptr), nullptr);

  ASSERT_EQ(buffer->Write(frame.data(), 95, 5), 0);
  DataUnit* unit = buffer->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  EXPECT_EQ(unit->length, 100u);
  EXPECT_EQ(unit->FrameLength(), 95u);
  EXPECT_EQ(std::string(unit->Frame(), 95), std::string(95, 'z'));
  buffer->ReadFinish(unit, false);
}

struct ReaderResult {
  uint64_t last = 0;
  uint64_t units = 0;
  uint64_t bad = 0;
  uint64_t out_of_order = 0;
};

// Reads until frame `final` shows up or the deadline passes, checking every unit and
// telling `on_unit` (when given) the number of each one.
ReaderResult ReadUntil(StreamBuffer* buffer, uint64_t final, bool check_sequence,
                       const std::function<void(uint64_t)>& on_unit = nullptr) {
  ReaderResult result;
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
  DataUnit* previous = nullptr;
  while (result.last != final && std::chrono::steady_clock::now() < deadline) {
    DataUnit* unit = buffer->ReadLatest(previous);
    if (unit == nullptr) {
      std::this_thread::yield();
      continue;
    }
    const uint64_t n = CheckedNumber(unit);
    if (n == 0 || (check_sequence && unit->sequence != static_cast<uint32_t>(n))) ++result.bad;
    if (n <= result.last) ++result.out_of_order;
    result.last = n;
    ++result.units;
    buffer->ReadFinish(unit, false);
    previous = unit;
    if (on_unit) on_unit(n);
  }
  return result;
}

// Waits until `done` holds, for a generous while; false when it never did.
bool WaitFor(const std::function<bool()>& done) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
  while (!done()) {
    if (std::chrono::steady_clock::now() >= deadline) return false;
    std::this_thread::yield();
  }
  return true;
}

TEST(StreamBufferTest, ReaderThreadsSeeWholeUnitsInOrder) {
  constexpr int kReaders = 4;
  constexpr uint64_t kFrames = 20000;
  // Newest + one held per reader + one free: the writer never has to drop.
  constexpr uint64_t kBatch = 50;
  LocalBuffer buffer(kReaders + 2, 512);
  std::vector<ReaderResult> results(kReaders);
  std::vector<std::atomic<uint64_t>> progress(kReaders);
  std::vector<std::thread> readers;
  for (int r = 0; r < kReaders; ++r) {
    readers.emplace_back([&, r] {
      results[r] = ReadUntil(buffer.get(), kFrames, true, [&](uint64_t n) { progress[r] = n; });
    });
  }
  // Every batch the writer lets each reader catch up, so that reading and writing
  // really interleave instead of the writer finishing before the readers start.
  int failed_writes = 0;
  bool caught_up = true;
  for (uint64_t n = 1; n <= kFrames; ++n) {
    if (WriteNumbered(buffer.get(), n) != 0) ++failed_writes;
    if (n % kBatch == 0 && caught_up) {
      caught_up = WaitFor([&] {
        for (const auto& p : progress) {
          if (p.load() < n) return false;
        }
        return true;
      });
    }
  }
  for (std::thread& t : readers) t.join();

  EXPECT_TRUE(caught_up);
  EXPECT_EQ(failed_writes, 0);
  for (const ReaderResult& r : results) {
    EXPECT_EQ(r.last, kFrames);
    EXPECT_GE(r.units, kFrames / kBatch);
    EXPECT_EQ(r.bad, 0u);
    EXPECT_EQ(r.out_of_order, 0u);
  }
}

TEST(StreamBufferTest, ReaderThreadsWithWriterShortOfSlots) {
  constexpr int kReaders = 4;
  constexpr uint64_t kFrames = 20000;
  constexpr uint64_t kBatch = 50;
  LocalBuffer buffer(2, 512);
  std::atomic<bool> done{false};
  std::vector<ReaderResult> results(kReaders);
  std::vector<std::atomic<uint64_t>> progress(kReaders);
  std::vector<uint64_t> final_seen(kReaders, 0);
  std::vector<std::thread> readers;
  for (int r = 0; r < kReaders; ++r) {
    readers.emplace_back([&, r] {
      ReaderResult& result = results[r];
      DataUnit* previous = nullptr;
      while (!done.load()) {
        DataUnit* unit = buffer->ReadLatest(previous);
        if (unit == nullptr) {
          std::this_thread::yield();
          continue;
        }
        const uint64_t n = CheckedNumber(unit);
        if (n == 0) ++result.bad;
        if (n <= result.last) ++result.out_of_order;
        result.last = n;
        ++result.units;
        buffer->ReadFinish(unit, false);
        previous = unit;
        progress[r] = n;
      }
      DataUnit* unit = buffer->ReadLatest(nullptr);
      if (unit != nullptr) {
        final_seen[r] = CheckedNumber(unit);
        buffer->ReadFinish(unit, false);
      }
    });
  }
  uint64_t written = 0;
  uint64_t last_written = 0;
  bool caught_up = true;
  for (uint64_t n = 1; n <= kFrames; ++n) {
    if (WriteNumbered(buffer.get(), n) == 0) {
      ++written;
      last_written = n;
    }
    if (n % kBatch == 0 && caught_up) {
      caught_up = WaitFor([&] {
        for (const auto& p : progress) {
          if (p.load() < last_written) return false;
        }
        return true;
      });
    }
  }
  done.store(true);
  for (std::thread& t : readers) t.join();

  EXPECT_TRUE(caught_up);
  EXPECT_GE(written, kFrames / kBatch);
  for (int r = 0; r < kReaders; ++r) {
    EXPECT_GE(results[r].units, kFrames / kBatch);
    EXPECT_EQ(results[r].bad, 0u);
    EXPECT_EQ(results[r].out_of_order, 0u);
    EXPECT_EQ(final_seen[r], last_written);
  }
  DataUnit* unit = buffer->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  EXPECT_EQ(unit->sequence, static_cast<uint32_t>(written));
  buffer->ReadFinish(unit, false);
}

TEST(StreamBufferTest, KeyMappingIsFixed) {
  EXPECT_EQ(IPCKeyFromBufId(0), static_cast<key_t>(0x45570000));
  EXPECT_EQ(IPCKeyFromBufId(524288 + 3), static_cast<key_t>(0x45570000 + 524288 + 3));
  EXPECT_NE(IPCKeyFromBufId(1), IPCKeyFromBufId(2));
  EXPECT_NE(IPCKeyFromBufId(1), IPC_PRIVATE);
}

TEST(StreamBufferTest, AttachToMissingBufferGivesNull) {
  const int id = UniqueId(0);
  StreamBuffer::RemoveShared(id);
  EXPECT_EQ(StreamBuffer::AttachShared(id), nullptr);
}

TEST(StreamBufferTest, AttachRejectsSegmentThatIsNoBuffer) {
  const int id = UniqueId(1);
  SegmentGuard guard(id);
  StreamBuffer::RemoveShared(id);
  const int shmid = shmget(IPCKeyFromBufId(id), 4096, IPC_CREAT | IPC_EXCL | 0600);
  ASSERT_GE(shmid, 0);
  EXPECT_EQ(StreamBuffer::AttachShared(id), nullptr);

  StreamBuffer::RemoveShared(id);

  // A well-formed header whose sizes go beyond its 4 KiB segment is refused too.
  LocalBuffer large(4, 2000);
  ASSERT_NE(large.get(), nullptr);
  ASSERT_GT(StreamBuffer::RequiredBytes(4, 2000), 4096u);
  const int small = shmget(IPCKeyFromBufId(id), 4096, IPC_CREAT | IPC_EXCL | 0600);
  ASSERT_GE(small, 0);
  void* memory = shmat(small, nullptr, 0);
  ASSERT_NE(memory, reinterpret_cast<void*>(-1));
  std::memcpy(memory, large.get(), 256);
  ASSERT_TRUE(static_cast<StreamBuffer*>(memory)->Valid());
  EXPECT_EQ(StreamBuffer::AttachShared(id), nullptr);
  shmdt(memory);
}

TEST(StreamBufferTest, CreateReplacesStaleSegment) {
  const int id = UniqueId(2);
  SegmentGuard guard(id);
  StreamBuffer::RemoveShared(id);
  ASSERT_GE(shmget(IPCKeyFromBufId(id), 128, IPC_CREAT | IPC_EXCL | 0600), 0);

  StreamBuffer* writer = StreamBuffer::CreateShared(id, 5, 256);
  ASSERT_NE(writer, nullptr);
  StreamBuffer* reader = StreamBuffer::AttachShared(id);
  ASSERT_NE(reader, nullptr);
  EXPECT_EQ(reader->SlotCount(), 5u);
  EXPECT_EQ(reader->SlotCapacity(), 256u);

  const int shmid = shmget(IPCKeyFromBufId(id), 0, 0);
  ASSERT_GE(shmid, 0);
  struct shmid_ds info;
  ASSERT_EQ(shmctl(shmid, IPC_STAT, &info), 0);
  EXPECT_EQ(info.shm_perm.mode & 0777, 0600u);
  EXPECT_GE(info.shm_segsz, StreamBuffer::RequiredBytes(5, 256));

  ASSERT_EQ(WriteNumbered(writer, 11), 0);
  DataUnit* unit = reader->ReadLatest(nullptr);
  ASSERT_NE(unit, nullptr);
  EXPECT_EQ(CheckedNumber(unit), 11u);
  reader->ReadFinish(unit, false);
  StreamBuffer::DetachShared(reader);
  StreamBuffer::DetachShared(writer);
}

// What the child process saw, sent back through a pipe.
struct ChildReport {
  int attached = 0;
  uint64_t units = 0;
  uint64_t last = 0;
  uint64_t bad = 0;
  uint64_t out_of_order = 0;
};

// Runs in the forked child: attaches as a detector does, by key alone, and reads. It sends
// 0 through `progress_fd` once attached, then the number of every unit that it reads.
[[noreturn]] void RunChildReader(int id, uint64_t final, int progress_fd, int result_fd) {
  ChildReport report;
  const int shmid = shmget(IPCKeyFromBufId(id), 0, 0);
  void* memory = shmid >= 0 ? shmat(shmid, nullptr, 0) : reinterpret_cast<void*>(-1);
  if (memory != reinterpret_cast<void*>(-1)) {
    report.attached = 1;
    StreamBuffer* buffer = static_cast<StreamBuffer*>(memory);
    const uint64_t ready = 0;
    if (write(progress_fd, &ready, sizeof(ready)) != sizeof(ready)) _exit(3);
    ReaderResult result = ReadUntil(buffer, final, true, [progress_fd](uint64_t n) {
      if (write(progress_fd, &n, sizeof(n)) != sizeof(n)) _exit(4);
    });
    report.units = result.units;
    report.last = result.last;
    report.bad = result.bad;
    report.out_of_order = result.out_of_order;
    shmdt(memory);
  }
  const bool sent = write(result_fd, &report, sizeof(report)) == sizeof(report);
  _exit(sent ? 0 : 2);
}

TEST(StreamBufferTest, ChildProcessReadsFramesThroughSharedMemory) {
  constexpr uint64_t kFrames = 3000;
  constexpr uint64_t kBatch = 100;
  const int id = UniqueId(3);
  SegmentGuard guard(id);
  StreamBuffer* buffer = StreamBuffer::CreateShared(id, 4, 512);
  ASSERT_NE(buffer, nullptr);

  FdGuard progress;
  FdGuard result;
  ASSERT_TRUE(progress.Open());
  ASSERT_TRUE(result.Open());
  const pid_t pid = fork();
  ASSERT_GE(pid, 0);
  if (pid == 0) RunChildReader(id, kFrames, progress.write_end(), result.write_end());
  ChildGuard child(pid);
  progress.CloseWrite();
  result.CloseWrite();

  uint64_t child_at = 1;
  ASSERT_TRUE(ReadFully(progress.read_end(), &child_at, sizeof(child_at), 30));
  ASSERT_EQ(child_at, 0u) << "child did not attach";
  // Every batch the parent waits for the child to read the newest frame, so the two
  // processes really take turns on the buffer.
  int failed_writes = 0;
  for (uint64_t n = 1; n <= kFrames; ++n) {
    if (WriteNumbered(buffer, n) != 0) ++failed_writes;
    while (n % kBatch == 0 && child_at < n) {
      ASSERT_TRUE(ReadFully(progress.read_end(), &child_at, sizeof(child_at), 30))
          << "child stopped reading at " << child_at;
    }
  }

  ChildReport report;
  ASSERT_TRUE(ReadFully(result.read_end(), &report, sizeof(report), 90)) << "no report";
  EXPECT_EQ(child.Reap(), 0);
  EXPECT_EQ(failed_writes, 0);
  EXPECT_EQ(report.attached, 1);
  EXPECT_GE(report.units, kFrames / kBatch);
  EXPECT_EQ(report.last, kFrames);
  EXPECT_EQ(report.bad, 0u);
  EXPECT_EQ(report.out_of_order, 0u);
  StreamBuffer::DetachShared(buffer);
}

TEST(StreamBufferTest, ParentReadsFramesAChildWrites) {
  constexpr uint64_t kFrames = 500;
  const int id = UniqueId(4);
  SegmentGuard guard(id);
  StreamBuffer* buffer = StreamBuffer::CreateShared(id, 3, 512);
  ASSERT_NE(buffer, nullptr);

  const pid_t pid = fork();
  ASSERT_GE(pid, 0);
  if (pid == 0) {
    StreamBuffer* mine = StreamBuffer::AttachShared(id);
    int failures = mine == nullptr ? 1 : 0;
    for (uint64_t n = 1; mine != nullptr && n <= kFrames; ++n) {
      if (WriteNumbered(mine, n) != 0) ++failures;
    }
    _exit(failures == 0 ? 0 : 1);
  }
  ChildGuard child(pid);
  ReaderResult seen = ReadUntil(buffer, kFrames, true);
  EXPECT_EQ(child.Reap(), 0);
  EXPECT_EQ(seen.last, kFrames);
  EXPECT_EQ(seen.bad, 0u);
  EXPECT_EQ(seen.out_of_order, 0u);
  StreamBuffer::DetachShared(buffer);
}

}  // namespace
