// Line splitter over a received buffer, shared by every camera module that scans a body
// line by line. Pure function; safe from any thread.

#ifndef EVWATCH_FRAMEWORK_READLINE_H_
#define EVWATCH_FRAMEWORK_READLINE_H_

// Reads the next line of buf[0, length) into line (zero-terminated), starting after
// `position`, which names the last byte consumed: the caller sets it to -1 before the first
// line. LF ends a line; CR ends it too and the byte after a CR is skipped whatever it is
// (taken to be the LF of a CR LF pair). Every other byte, a zero byte included, is stored.
// A line that fills lineSize is cut: its last stored byte becomes the terminator and the
// rest of the source line is the next line. Returns the number of characters counted,
// never negative; a line whose first byte is zero marks the end for callers.
// REQUIRES: lineSize >= 1.
int ReadLineFromBuf(const char* buf, int& position, int length, char* line, int lineSize);

#endif  // EVWATCH_FRAMEWORK_READLINE_H_
