// String helpers that the host's transport, its text helpers and the simulator share:
// trimming and ASCII case-insensitive comparison. Pure functions; safe from any thread.

#ifndef EVWATCH_HOST_TEXT_STRUTIL_H_
#define EVWATCH_HOST_TEXT_STRUTIL_H_

#include <string_view>

// The blanks around a header value or a line: space, tab and the line end.
inline constexpr std::string_view kLineBlanks = " \t\r\n";

// s without the characters of `blanks` at either end. The result views s.
std::string_view TrimBlanks(std::string_view s, std::string_view blanks = kLineBlanks);

// a equals b, ASCII letters compared without case.
bool EqualsNoCase(std::string_view a, std::string_view b);

// s begins with prefix, ASCII letters compared without case.
bool StartsNoCase(std::string_view s, std::string_view prefix);

#endif  // EVWATCH_HOST_TEXT_STRUTIL_H_
