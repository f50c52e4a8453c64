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

// Size of the line buffer of the stream detectors' line scans.
inline constexpr int kScanLineSize = 128;

// What a line scan's judge says of one line.
enum class LineVerdict {
  kNext,   // go on with the next line
  kEvent,  // the text shows the event: the scan ends with 1
  kEnd,    // the scan ends with 0 (a line that ends before its first field, say)
};

// Reads buf[0, length) line by line with ReadLineFromBuf into a kScanLineSize buffer (a
// longer line is cut at 127 characters, its 128th is lost and the rest is the next line)
// and calls judge(line) (LineVerdict(const char*)) on
// each non-empty one, until it says kEvent (1) or kEnd (0) or the text ends (0). A negative
// length returns 0 at once, judging nothing.
template <typename Judge>
int ScanLines(const char* buf, int length, Judge&& judge) {
  if (length < 0) return 0;
  char line[kScanLineSize];
  int position = -1;
  do {
    ReadLineFromBuf(buf, position, length, line, kScanLineSize);
    if (line[0] == '\0') continue;
    switch (judge(static_cast<const char*>(line))) {
      case LineVerdict::kNext:
        break;
      case LineVerdict::kEvent:
        return 1;
      case LineVerdict::kEnd:
        return 0;
    }
  } while (length > position);
  return 0;
}

#endif  // EVWATCH_FRAMEWORK_READLINE_H_
