#include "framework/streampart.h"

#include <cstring>
#include <new>

#include "framework/host/fetcher.h"

StreamPart::Result StreamPart::Read(MultipartFetch* fetch, bool clear) {
  if (fetch->ReadPartHeader(&length_, header_, kHeaderSize) != 0) return kNoHeader;
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
  } else if (clear) {
    memset(inner_, 0, sizeof(inner_));
  }
  if (fetch->ReadPartBody(Body(), length_) != 0) {
    fetch->SkipContent(Body(), length_);
    heap_.reset();
    return kNoBody;
  }
  return kRead;
}
