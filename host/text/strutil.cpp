#include "host/text/strutil.h"

#include <strings.h>

std::string_view TrimBlanks(std::string_view s, std::string_view blanks) {
  size_t begin = s.find_first_not_of(blanks);
  if (begin == std::string_view::npos) return {};
  size_t end = s.find_last_not_of(blanks);
  return s.substr(begin, end - begin + 1);
}

bool EqualsNoCase(std::string_view a, std::string_view b) {
  return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

bool StartsNoCase(std::string_view s, std::string_view prefix) {
  return s.size() >= prefix.size() && EqualsNoCase(s.substr(0, prefix.size()), prefix);
}
