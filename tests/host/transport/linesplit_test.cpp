#include "host/transport/linesplit.h"

#include <cstring>

#include <gtest/gtest.h>

namespace {

LineSplit Split(const char* text, size_t limit, bool at_end) {
  return SplitLine(text, std::strlen(text), limit, at_end);
}

TEST(LineSplitTest, LineEndsAtLfOrCrLf) {
  LineSplit lf = Split("abc\nrest", 100, false);
  EXPECT_TRUE(lf.found);
  EXPECT_EQ(lf.stored, 3u);
  EXPECT_EQ(lf.consumed, 4u);
  LineSplit crlf = Split("abc\r\nrest", 100, false);
  EXPECT_TRUE(crlf.found);
  EXPECT_EQ(crlf.stored, 3u);
  EXPECT_EQ(crlf.consumed, 5u);
}

TEST(LineSplitTest, EmptyLineIsALine) {
  LineSplit split = Split("\r\nabc", 100, false);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 0u);
  EXPECT_EQ(split.consumed, 2u);
}

TEST(LineSplitTest, UnfinishedLineWaitsForMoreBytes) {
  EXPECT_FALSE(Split("abc", 100, false).found);
  EXPECT_FALSE(Split("", 100, false).found);
  // A CR alone may still be followed by its LF.
  EXPECT_FALSE(Split("abc\r", 100, false).found);
}

TEST(LineSplitTest, LongLineIsCutAtTheLimitAndItsRestIsTheNextLine) {
  LineSplit split = Split("abcdefgh\n", 4, false);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 4u);
  EXPECT_EQ(split.consumed, 4u);
}

TEST(LineSplitTest, LineOfExactlyTheLimitIsWhole) {
  LineSplit split = Split("abcd\r\n", 4, false);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 4u);
  EXPECT_EQ(split.consumed, 6u);
}

TEST(LineSplitTest, LongLineWithoutEndIsCutOnceLimitAndLineEndRoomArrived) {
  // limit + 2 bytes without LF: no line end can make this line short enough.
  LineSplit split = Split("abcdef", 4, false);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 4u);
  EXPECT_EQ(split.consumed, 4u);
  // limit + 1 bytes: the last may be a CR whose LF ends a line of exactly the limit.
  EXPECT_FALSE(Split("abcde", 4, false).found);
}

TEST(LineSplitTest, AtEndTheLastLineNeedsNoLineEnd) {
  LineSplit split = Split("abc", 100, true);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 3u);
  EXPECT_EQ(split.consumed, 3u);
  EXPECT_FALSE(Split("", 100, true).found);
}

TEST(LineSplitTest, AtEndALongLastLineIsStillCut) {
  LineSplit split = Split("abcde", 4, true);
  EXPECT_TRUE(split.found);
  EXPECT_EQ(split.stored, 4u);
  EXPECT_EQ(split.consumed, 4u);
}

}  // namespace
