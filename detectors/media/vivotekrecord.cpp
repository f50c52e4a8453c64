#include "detectors/media/vivotekrecord.h"

#include <cstring>

namespace {

const unsigned int kTagSize = 4;
const unsigned int kCountOffset = 15;  // from the tag's start

}  // namespace

bool ReadVivotekRecord(const unsigned char* data, unsigned int length, const char* tag,
                       bool zeroAfterTag, unsigned int& level) {
  if (data == nullptr || length < kTagSize + 1) return false;
  auto at = [data, length](unsigned int i) -> unsigned char { return i < length ? data[i] : 0; };
  unsigned int start = 0;
  bool found = false;
  for (; start <= length - (kTagSize + 1); ++start) {
    if (std::memcmp(data + start, tag, kTagSize) == 0 && (!zeroAfterTag || at(start + 5) == 0)) {
      found = true;
      break;
    }
  }
  if (!found) return false;
  const unsigned int count_at = start + kCountOffset;
  if (at(count_at) == 0) return false;
  const unsigned char first = at(count_at + 1);
  if ((first & 0x80) == 0) return false;
  level = ((first << 1) & 0x7E) | (at(count_at + 2) >> 7);
  return (first & 0x40) != 0;
}
