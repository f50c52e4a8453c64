// Where the next line ends in received bytes. The HTTP client and the TCP socket both cut
// lines with it, so that both cut them alike. Pure function; safe from any thread.

#ifndef EVWATCH_HOST_TRANSPORT_LINESPLIT_H_
#define EVWATCH_HOST_TRANSPORT_LINESPLIT_H_

#include <cstddef>

// A line is the bytes before LF or CR LF; one longer than `limit` characters is cut after
// `limit` and its rest is the next line.
struct LineSplit {
  bool found = false;   // false: more bytes are needed to decide
  size_t stored = 0;    // characters of the line
  size_t consumed = 0;  // bytes to drop: the line and its line end
};

// `at_end`: no more bytes will come, so the last line may lack its line end.
LineSplit SplitLine(const char* data, size_t size, size_t limit, bool at_end);

#endif  // EVWATCH_HOST_TRANSPORT_LINESPLIT_H_
