// One part of a camera's multipart stream, read whole into memory: the body goes to a
// 1024-byte buffer inside the object (which callers keep on their stack) or, for a longer
// part, to a heap buffer of exactly the part's length that lives as long as the object. The
// event-stream detectors read every part through it.
//
// Threads: an object belongs to the one thread that reads with it.

#ifndef EVWATCH_FRAMEWORK_STREAMPART_H_
#define EVWATCH_FRAMEWORK_STREAMPART_H_

#include <memory>

class MultipartFetch;

class StreamPart {
 public:
  // Size of the buffer that holds a short part without allocation.
  static constexpr int kStackSize = 1024;
  // Size of the part-header buffer handed to the fetcher.
  static constexpr int kHeaderSize = 128;

  enum Result {
    kRead,      // header and body are in; Body() and Length() give them
    kNoHeader,  // the header read failed; nothing was skipped
    kNoBody,    // no room for the body (allocation failed or the length is beyond the
                // fetcher's cap) or its read failed; the rest of the part was skipped
  };

  StreamPart() = default;
  StreamPart(const StreamPart&) = delete;
  StreamPart& operator=(const StreamPart&) = delete;

  // Reads the next part of fetch. A length that is greater than kStackSize when taken as
  // unsigned (so a negative one too) needs a heap buffer. With `clear`, the inner buffer
  // is zeroed before a short part is read into it, so its text ends with the part.
  // REQUIRES: fetch is not null; called once per object.
  Result Read(MultipartFetch* fetch, bool clear);

  // After kRead: the body (not zero-terminated) and its length.
  char* Body() { return heap_ != nullptr ? heap_.get() : inner_; }
  int Length() const { return length_; }
  // Whether the body needed a heap buffer.
  bool OnHeap() const { return heap_ != nullptr; }

 private:
  char header_[kHeaderSize];
  char inner_[kStackSize];
  std::unique_ptr<char[]> heap_;  // exactly length_ bytes, for a part beyond kStackSize
  int length_ = 0;                // as the part header gave it
};

#endif  // EVWATCH_FRAMEWORK_STREAMPART_H_
