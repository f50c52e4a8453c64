#include "host/transport/headerlines.h"

#include <cstring>

#include <gtest/gtest.h>

namespace {

std::string_view Text(const char* line) { return HeaderLineText(line, std::strlen(line)); }

TEST(HeaderLinesTest, LineEndIsDropped) {
  EXPECT_EQ(Text("Content-Type: text/plain\r\n"), "Content-Type: text/plain");
  EXPECT_EQ(Text("CSeq: 2\n"), "CSeq: 2");
  EXPECT_EQ(Text("\r\n"), "");
}

TEST(HeaderLinesTest, NameAndValueAreTrimmed) {
  HeaderList headers;
  // A leading blank continues the previous header, and there is none yet.
  AddHeaderLine(" Session : 12345678;timeout=60 ", &headers);
  EXPECT_TRUE(headers.empty());
  AddHeaderLine("Session : 12345678;timeout=60 ", &headers);
  ASSERT_EQ(headers.size(), 1u);
  EXPECT_EQ(headers[0].first, "Session");
  EXPECT_EQ(headers[0].second, "12345678;timeout=60");
}

TEST(HeaderLinesTest, FoldedLineContinuesTheValue) {
  HeaderList headers;
  AddHeaderLine("WWW-Authenticate: Digest realm=\"cam\",", &headers);
  AddHeaderLine("\tnonce=\"abc\"", &headers);
  ASSERT_EQ(headers.size(), 1u);
  EXPECT_EQ(headers[0].second, "Digest realm=\"cam\", nonce=\"abc\"");
}

TEST(HeaderLinesTest, LineWithoutColonOrEmptyIsPassedOver) {
  HeaderList headers;
  AddHeaderLine("garbage", &headers);
  AddHeaderLine("", &headers);
  EXPECT_TRUE(headers.empty());
}

}  // namespace
