#include "framework/host/textutil.h"

#include <cstring>

namespace {

std::string Trim(const std::string& s) {
  const char* blanks = " \t\r";
  size_t begin = s.find_first_not_of(blanks);
  if (begin == std::string::npos) return "";
  size_t end = s.find_last_not_of(blanks);
  return s.substr(begin, end - begin + 1);
}

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
    if (at != std::string::npos && Trim(entry.substr(0, at)) == key) {
      value = Trim(entry.substr(at + assign_len));
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
