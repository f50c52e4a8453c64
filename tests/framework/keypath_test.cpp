#include "framework/keypath.h"

#include <gtest/gtest.h>

#include <list>
#include <string>

namespace {

std::list<std::string> Split(const std::string& key) {
  std::list<std::string> path;
  SplitKeyPath(key, path);
  return path;
}

TEST(KeyPathTest, SplitsAtEverySlashInOrder) {
  EXPECT_EQ(Split("EventNotificationAlert/eventType"),
            (std::list<std::string>{"EventNotificationAlert", "eventType"}));
  EXPECT_EQ(Split("a/b/c"), (std::list<std::string>{"a", "b", "c"}));
  EXPECT_EQ(Split("single"), (std::list<std::string>{"single"}));
}

TEST(KeyPathTest, EmptyPiecesBeforeASlashAreKept) {
  EXPECT_EQ(Split("/a"), (std::list<std::string>{"", "a"}));
  EXPECT_EQ(Split("a//b"), (std::list<std::string>{"a", "", "b"}));
  EXPECT_EQ(Split("/"), (std::list<std::string>{""}));
}

TEST(KeyPathTest, TrailingSlashAddsNothing) {
  EXPECT_EQ(Split("a/"), (std::list<std::string>{"a"}));
  EXPECT_EQ(Split("a/b/"), (std::list<std::string>{"a", "b"}));
  EXPECT_TRUE(Split("").empty());
}

TEST(KeyPathTest, AppendsToWhatThePathHolds) {
  std::list<std::string> path{"x"};
  SplitKeyPath("a/b", path);
  EXPECT_EQ(path, (std::list<std::string>{"x", "a", "b"}));
}

}  // namespace
