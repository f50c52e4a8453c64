#include "host/transport/linesplit.h"

#include <algorithm>
#include <cstring>

LineSplit SplitLine(const char* data, size_t size, size_t limit, bool at_end) {
  LineSplit split;
  // limit characters, then CR LF: nothing further decides whether the line is cut.
  size_t scan = std::min(size, limit + 2);
  const void* lf = scan > 0 ? std::memchr(data, '\n', scan) : nullptr;
  if (lf != nullptr) {
    size_t at = static_cast<size_t>(static_cast<const char*>(lf) - data);
    size_t length = (at > 0 && data[at - 1] == '\r') ? at - 1 : at;
    split.found = true;
    if (length <= limit) {
      split.stored = length;
      split.consumed = at + 1;
    } else {
      split.stored = split.consumed = limit;
    }
    return split;
  }
  if (size >= limit + 2 || (at_end && size > limit)) {
    split.found = true;
    split.stored = split.consumed = limit;
  } else if (at_end && size > 0) {
    split.found = true;
    split.stored = split.consumed = size;
  }
  return split;
}
