#include "framework/readline.h"

int ReadLineFromBuf(const char* buf, int& position, int length, char* line, int lineSize) {
  int count = 0;
  for (;;) {
    ++position;
    if (position >= length) break;
    char c = buf[position];
    if (c == '\r') {
      ++position;  // the assumed LF of a CR LF pair, unchecked on purpose
      break;
    }
    if (c == '\n') break;
    line[count++] = c;
    if (count == lineSize) {
      line[count - 1] = '\0';
      return count;
    }
  }
  line[count] = '\0';
  return count;
}
