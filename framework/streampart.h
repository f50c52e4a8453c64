// One part of a camera's multipart stream, read whole into memory: the body goes to a
// 1024-byte buffer inside the object (which callers keep on their stack) or, for a longer
// part, to a heap buffer of exactly the part's length that lives as long as the object. The
// event-stream detectors read every part through it; what differs between them (the size of
// the part-header buffer, a cleared buffer, the text a camera sends before or after a body)
// is a Shape.
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
  // Size of the part-header buffer handed to the fetcher unless a Shape says otherwise.
  static constexpr int kHeaderSize = 128;
  // The largest part-header buffer a Shape may ask for.
  static constexpr int kMaxHeaderSize = 256;

  // Text besides the body that some cameras put their events in. It is copied, after the
  // body has been read, into the body's buffer (whose start it overwrites) and ends with a
  // zero byte there.
  enum class Extra {
    kNone,
    kBefore,  // the part's header lines (MultipartFetch::FetchFrontOptContent)
    kAfter,   // the text between the body and the next boundary (FetchBackOptContent)
  };

  struct Shape {
    int header_size = kHeaderSize;  // 1..kMaxHeaderSize
    bool clear = false;             // zero the inner buffer before a short part is read
    Extra extra = Extra::kNone;
  };

  enum Result {
    kRead,      // header and body (and the extra text) are in
    kNoHeader,  // the header read failed; nothing was skipped
    kNoBody,    // no room for the body (allocation failed or the length is beyond the
                // fetcher's cap), or its read or that of the extra text failed; the rest of
                // the part was skipped
  };

  StreamPart() = default;
  StreamPart(const StreamPart&) = delete;
  StreamPart& operator=(const StreamPart&) = delete;

  // Reads the next part of fetch. A length that is greater than kStackSize when taken as
  // unsigned (so a negative one too) needs a heap buffer. With shape.clear, the inner
  // buffer is zeroed before a short part is read into it, so its text ends with the part.
  // REQUIRES: fetch is not null; called once per object.
  Result Read(MultipartFetch* fetch, const Shape& shape);
  Result Read(MultipartFetch* fetch, bool clear) {
    Shape shape;
    shape.clear = clear;
    return Read(fetch, shape);
  }

  // After kRead: the body (not zero-terminated) and its length.
  char* Body() { return heap_ != nullptr ? heap_.get() : inner_; }
  int Length() const { return length_; }
  // Whether the body needed a heap buffer.
  bool OnHeap() const { return heap_ != nullptr; }
  // After a header was read: its text, zero-terminated, cut to the shape's header_size - 1.
  const char* Header() const { return header_; }
  // After kRead: how much of Body() a detector judges. With Extra::kBefore the text before
  // the body up to its zero byte; otherwise the body's length (with kAfter the trailing
  // text has overwritten the body's start, and the bytes of the body behind it are judged
  // too, as those cameras expect).
  int JudgedLength() const;

 private:
  char header_[kMaxHeaderSize];
  char inner_[kStackSize];
  std::unique_ptr<char[]> heap_;  // exactly length_ bytes, for a part beyond kStackSize
  int length_ = 0;                // as the part header gave it
  Extra extra_ = Extra::kNone;    // the shape's, for JudgedLength
};

// One part read as `shape` says and judged: judge(text, length) gets Body() and
// JudgedLength() and returns whether the part shows the event, which goes to `event`.
// 0 when a part was read and judged; -1 (event false) when fetch is null or the part could
// not be read.
template <typename Judge>
int ReadJudgedPart(MultipartFetch* fetch, const StreamPart::Shape& shape, bool& event,
                   Judge&& judge) {
  event = false;
  if (fetch == nullptr) return -1;
  StreamPart part;
  if (part.Read(fetch, shape) != StreamPart::kRead) return -1;
  event = judge(part.Body(), part.JudgedLength());
  return 0;
}

#endif  // EVWATCH_FRAMEWORK_STREAMPART_H_
