#include "framework/readline.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

std::vector<std::string> Lines(const std::string& text, int lineSize, int maxLines = 20) {
  std::vector<std::string> lines;
  std::vector<char> line(static_cast<size_t>(lineSize));
  int position = -1;
  for (int i = 0; i < maxLines && position < static_cast<int>(text.size()) - 1; ++i) {
    int n = ReadLineFromBuf(text.data(), position, static_cast<int>(text.size()), line.data(),
                            lineSize);
    EXPECT_GE(n, 0);
    lines.emplace_back(line.data());
  }
  return lines;
}

TEST(ReadLineFromBufTest, CrLfPairEndsALine) {
  EXPECT_EQ(Lines("ab\r\ncd", 256), (std::vector<std::string>{"ab", "cd"}));
}

TEST(ReadLineFromBufTest, LoneCrSwallowsTheNextByte) {
  EXPECT_EQ(Lines("ab\rcd", 256), (std::vector<std::string>{"ab", "d"}));
}

TEST(ReadLineFromBufTest, LfAloneEndsALine) {
  EXPECT_EQ(Lines("ab\ncd\n", 256), (std::vector<std::string>{"ab", "cd"}));
}

TEST(ReadLineFromBufTest, TextWithoutTerminatorIsOneLine) {
  EXPECT_EQ(Lines("group=0;level=1", 256), (std::vector<std::string>{"group=0;level=1"}));
}

TEST(ReadLineFromBufTest, PositionNamesLastByteConsumed) {
  const std::string text = "ab\r\ncd";
  char line[16];
  int position = -1;
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 6, line, 16), 2);
  EXPECT_EQ(position, 3);  // the LF after the CR
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 6, line, 16), 2);
  EXPECT_STREQ(line, "cd");
  EXPECT_EQ(position, 6);
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 6, line, 16), 0);
  EXPECT_STREQ(line, "");
}

TEST(ReadLineFromBufTest, LongLineIsCutAndItsRestIsTheNextLine) {
  // A 4-byte line buffer: the fourth character fills it and is overwritten by the
  // terminator, so it is lost; the line goes on after it.
  const std::string text = "abcdefg\nh";
  char line[4];
  int position = -1;
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 9, line, 4), 4);
  EXPECT_STREQ(line, "abc");
  EXPECT_EQ(position, 3);
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 9, line, 4), 3);
  EXPECT_STREQ(line, "efg");
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 9, line, 4), 1);
  EXPECT_STREQ(line, "h");
}

TEST(ReadLineFromBufTest, ZeroByteIsStoredAndEndsTheStringForCallers) {
  const std::string text("\0ab\n", 4);
  char line[16];
  int position = -1;
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 4, line, 16), 3);
  EXPECT_EQ(line[0], '\0');
  EXPECT_EQ(line[1], 'a');
}

TEST(ReadLineFromBufTest, EmptyLinesCountZero) {
  const std::string text = "\n\nx";
  char line[16];
  int position = -1;
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 3, line, 16), 0);
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 3, line, 16), 0);
  EXPECT_EQ(ReadLineFromBuf(text.data(), position, 3, line, 16), 1);
  EXPECT_STREQ(line, "x");
}

// The lines ScanLines hands to its judge, which says kNext to all of them.
std::vector<std::string> LinesSeen(const std::string& text, int length) {
  std::vector<std::string> seen;
  EXPECT_EQ(ScanLines(text.data(), length, [&seen](const char* line) {
              seen.push_back(line);
              return LineVerdict::kNext;
            }),
            0);
  return seen;
}

TEST(ScanLinesTest, JudgesEachNonEmptyLineUpToTheLength) {
  EXPECT_EQ(LinesSeen("a\r\n\nb\nc", 8), (std::vector<std::string>{"a", "b", "c"}));
  EXPECT_EQ(LinesSeen("a\nbc", 3), (std::vector<std::string>{"a", "b"}));
  EXPECT_EQ(LinesSeen("a\rbc", 4), (std::vector<std::string>{"a", "c"})) << "CR skips a byte";
  EXPECT_EQ(LinesSeen("abc", 0), (std::vector<std::string>{}));
  EXPECT_EQ(LinesSeen("abc", -1), (std::vector<std::string>{}));
}

TEST(ScanLinesTest, LongLineIsCutAt127AndGoesOnAsTheNextLine) {
  // The 128th character fills the line buffer and gives way to the terminator.
  const std::string text = std::string(127, 'x') + "yz";
  EXPECT_EQ(LinesSeen(text, static_cast<int>(text.size())),
            (std::vector<std::string>{std::string(127, 'x'), "z"}));
}

TEST(ScanLinesTest, EventAndEndStopTheScan) {
  const std::string text = "a\nstop\nb\nhit\nc\n";
  std::vector<std::string> seen;
  auto judge = [&seen](LineVerdict on_stop, LineVerdict on_hit) {
    return [&seen, on_stop, on_hit](const char* line) {
      seen.push_back(line);
      if (std::string(line) == "stop") return on_stop;
      if (std::string(line) == "hit") return on_hit;
      return LineVerdict::kNext;
    };
  };
  const int length = static_cast<int>(text.size());
  EXPECT_EQ(ScanLines(text.data(), length, judge(LineVerdict::kEnd, LineVerdict::kEvent)), 0);
  EXPECT_EQ(seen, (std::vector<std::string>{"a", "stop"}));
  seen.clear();
  EXPECT_EQ(ScanLines(text.data(), length, judge(LineVerdict::kNext, LineVerdict::kEvent)), 1);
  EXPECT_EQ(seen, (std::vector<std::string>{"a", "stop", "b", "hit"}));
}

}  // namespace
