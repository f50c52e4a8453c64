#include "framework/host/textutil.h"

#include <gtest/gtest.h>

namespace {

TEST(FindKeyValTest, FindsExactKeyAndTrimsValue) {
  std::string value = "old";
  EXPECT_EQ(FindKeyVal("a=1\nmotion = on \r\nb=2", "motion", value, "=", "\n"), 0);
  EXPECT_EQ(value, "on");
}

TEST(FindKeyValTest, KeyMustMatchWholeAndCase) {
  std::string value = "old";
  EXPECT_EQ(FindKeyVal("motion2=on\nMotion=on", "motion", value, "=", "\n"), -1);
  EXPECT_EQ(value, "old");
}

TEST(FindKeyValTest, FirstMatchWinsAndValueMayHoldAssign) {
  std::string value;
  EXPECT_EQ(FindKeyVal("k=a=b\nk=c", "k", value, "=", "\n"), 0);
  EXPECT_EQ(value, "a=b");
}

TEST(FindKeyValTest, LastEntryWithoutSeparatorAndEmptyValue) {
  std::string value = "x";
  EXPECT_EQ(FindKeyVal("a=1\nb=", "b", value, "=", "\n"), 0);
  EXPECT_EQ(value, "");
}

TEST(FindKeyValTest, EmptyDelimitersFail) {
  std::string value = "x";
  EXPECT_EQ(FindKeyVal("a=1", "a", value, "", "\n"), -1);
  EXPECT_EQ(FindKeyVal("a=1", "a", value, "=", ""), -1);
  EXPECT_EQ(FindKeyVal("a=1", "a", value, nullptr, "\n"), -1);
  EXPECT_EQ(value, "x");
}

TEST(ItosTest, DecimalText) {
  EXPECT_EQ(itos(0), "0");
  EXPECT_EQ(itos(-42), "-42");
  EXPECT_EQ(itos(9223372036854775807LL), "9223372036854775807");
}

TEST(TimevalDiffTest, LaterMinusEarlierInMicroseconds) {
  timeval earlier{10, 900000};
  timeval later{30, 100000};
  EXPECT_EQ(TimevalDiff(earlier, later), 19200000LL);
  EXPECT_EQ(TimevalDiff(later, earlier), -19200000LL);
}

}  // namespace
