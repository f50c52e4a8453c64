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

}  // namespace
