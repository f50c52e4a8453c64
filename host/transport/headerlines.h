// The header lines of a response head (HTTP or RTSP) as libcurl hands them over, one call per
// line, read the same way by the HTTP engine and the RTSP session. Pure functions.

#ifndef EVWATCH_HOST_TRANSPORT_HEADERLINES_H_
#define EVWATCH_HOST_TRANSPORT_HEADERLINES_H_

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

using HeaderList = std::vector<std::pair<std::string, std::string>>;

// The line without its line end.
std::string_view HeaderLineText(const char* data, size_t size);

// Adds a "Name: value" line to headers, blanks trimmed; a line that begins with a blank
// continues the previous header's value. A line without a colon is passed over.
void AddHeaderLine(std::string_view line, HeaderList* headers);

#endif  // EVWATCH_HOST_TRANSPORT_HEADERLINES_H_
