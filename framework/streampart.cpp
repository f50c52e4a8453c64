#include "framework/streampart.h"

#include <cstring>
#include <new>

#include "framework/host/fetcher.h"

// The extra text is copied into the body's buffer, which must hold the longest the fetcher
// gives; a heap buffer is always longer than the inner one.
static_assert(StreamPart::kStackSize >= MultipartFetch::kOptContentSize,
              "the inner buffer must hold the fetcher's extra text");

StreamPart::Result StreamPart::Read(MultipartFetch* fetch, const Shape& shape) {
  extra_ = shape.extra;
  header_[0] = '\0';
  int header_size = shape.header_size;
  if (header_size < 1 || header_size > kMaxHeaderSize) header_size = kHeaderSize;
  if (fetch->ReadPartHeader(&length_, header_, header_size) != 0) return kNoHeader;
  const unsigned int size = static_cast<unsigned int>(length_);
  if (size > static_cast<unsigned int>(kStackSize)) {
    // The fetcher refuses longer parts; a length beyond its cap is treated as an
    // allocation that failed rather than trusted.
    if (size <= static_cast<unsigned int>(MultipartFetch::kMaxPartLength)) {
      heap_.reset(new (std::nothrow) char[size]);
    }
    if (heap_ == nullptr) {
      fetch->SkipContent(inner_, kStackSize);
      return kNoBody;
    }
  } else if (shape.clear) {
    memset(inner_, 0, sizeof(inner_));
  }
  bool ok = fetch->ReadPartBody(Body(), length_) == 0;
  unsigned char* text = reinterpret_cast<unsigned char*>(Body());
  if (ok && shape.extra == Extra::kBefore) ok = fetch->FetchFrontOptContent(text) == 0;
  if (ok && shape.extra == Extra::kAfter) ok = fetch->FetchBackOptContent(text) == 0;
  if (!ok) {
    fetch->SkipContent(Body(), length_);
    heap_.reset();
    return kNoBody;
  }
  return kRead;
}

int StreamPart::JudgedLength() const {
  if (extra_ != Extra::kBefore) return length_;
  const char* text = heap_ != nullptr ? heap_.get() : inner_;
  const size_t room = heap_ != nullptr ? static_cast<size_t>(length_) : sizeof(inner_);
  return static_cast<int>(strnlen(text, room));
}
