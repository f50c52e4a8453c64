#include "host/text/strutil.h"

#include <gtest/gtest.h>

namespace {

TEST(StrUtilTest, TrimBlanksDropsLineBlanksAtBothEnds) {
  EXPECT_EQ(TrimBlanks(" \t value x \r\n"), "value x");
  EXPECT_EQ(TrimBlanks("\r\nvalue"), "value");
  EXPECT_EQ(TrimBlanks("value"), "value");
}

TEST(StrUtilTest, TrimBlanksOfOnlyBlanksIsEmpty) {
  EXPECT_EQ(TrimBlanks(" \t\r\n"), "");
  EXPECT_EQ(TrimBlanks(""), "");
}

TEST(StrUtilTest, TrimBlanksTakesItsOwnSet) {
  // A line end is kept when the caller's set leaves it out.
  EXPECT_EQ(TrimBlanks(" a\n ", " \t\r"), "a\n");
  EXPECT_EQ(TrimBlanks("--a--", "-"), "a");
}

TEST(StrUtilTest, TrimBlanksViewsItsArgument) {
  std::string_view s = "  abc  ";
  std::string_view t = TrimBlanks(s);
  EXPECT_EQ(t.data(), s.data() + 2);
  EXPECT_EQ(t.size(), 3u);
}

TEST(StrUtilTest, EqualsNoCaseComparesAsciiLettersWithoutCase) {
  EXPECT_TRUE(EqualsNoCase("Content-Type", "content-type"));
  EXPECT_TRUE(EqualsNoCase("", ""));
  EXPECT_FALSE(EqualsNoCase("Content-Type", "Content-Typ"));
  EXPECT_FALSE(EqualsNoCase("abc", "abd"));
}

TEST(StrUtilTest, StartsNoCaseComparesThePrefixOnly) {
  EXPECT_TRUE(StartsNoCase("Content-Type: text/plain", "content-type:"));
  EXPECT_TRUE(StartsNoCase("abc", ""));
  EXPECT_FALSE(StartsNoCase("ab", "abc"));
  EXPECT_FALSE(StartsNoCase("xbc", "abc"));
}

}  // namespace
