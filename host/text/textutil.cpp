#include "framework/host/textutil.h"

#include <cstring>
#include <string_view>

#include "host/text/strutil.h"

namespace {

// Blanks around an entry's name and value; a line end is the separator's business.
constexpr std::string_view kEntryBlanks = " \t\r";

}  // namespace

int FindKeyVal(std::string text, std::string key, std::string& value, const char* assign,
               const char* separator) {
  if (assign == nullptr || separator == nullptr) return -1;
  const size_t assign_len = strlen(assign), separator_len = strlen(separator);
  if (assign_len == 0 || separator_len == 0) return -1;
  size_t begin = 0;
  while (begin <= text.size()) {
    size_t end = text.find(separator, begin);
    if (end == std::string::npos) end = text.size();
    std::string entry = text.substr(begin, end - begin);
    size_t at = entry.find(assign);
    if (at != std::string::npos && TrimBlanks(std::string_view(entry).substr(0, at), kEntryBlanks) == key) {
      value = std::string(TrimBlanks(std::string_view(entry).substr(at + assign_len), kEntryBlanks));
      return 0;
    }
    begin = end + separator_len;
  }
  return -1;
}

std::string itos(long long value) { return std::to_string(value); }

long long TimevalDiff(const timeval& earlier, const timeval& later) {
  return (static_cast<long long>(later.tv_sec) - earlier.tv_sec) * 1000000LL +
         (static_cast<long long>(later.tv_usec) - earlier.tv_usec);
}
