// StreamPart over a loopback multipart stream: which buffer a part goes to, what it reads,
// and how failed reads leave the stream.

#include "framework/streampart.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "framework/host/fetcher.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::FakeCamera;
using evtest::FetchFrom;
using evtest::Push;
using evtest::PushHandler;

const char kPath[] = "/stream";

class StreamPartTest : public ::testing::Test {
 protected:
  void PushParts(std::vector<std::string> parts) {
    cam_.Handle(kPath, PushHandler({Push{std::move(parts)}}));
    fetch_ = FetchFrom(cam_, kPath);
  }

  FakeCamera cam_;
  std::unique_ptr<MultipartFetch> fetch_;
};

TEST_F(StreamPartTest, PartOf1024BytesStaysInTheInnerBuffer) {
  const std::string body(1024, 'a');
  PushParts({body});
  StreamPart part;
  ASSERT_EQ(part.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_FALSE(part.OnHeap());
  ASSERT_EQ(part.Length(), 1024);
  EXPECT_EQ(std::string(part.Body(), 1024), body);
}

TEST_F(StreamPartTest, PartOf1025BytesGetsAHeapBufferOfItsLength) {
  std::string body(1024, 'b');
  body += 'z';
  PushParts({body});
  StreamPart part;
  ASSERT_EQ(part.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_TRUE(part.OnHeap());
  ASSERT_EQ(part.Length(), 1025);
  // Under AddressSanitizer a buffer shorter than the part would fail this read.
  EXPECT_EQ(std::string(part.Body(), 1025), body);
}

TEST_F(StreamPartTest, ClearedInnerBufferEndsWithThePart) {
  PushParts({"short"});
  StreamPart part;
  ASSERT_EQ(part.Read(fetch_.get(), true), StreamPart::kRead);
  EXPECT_EQ(part.Length(), 5);
  EXPECT_STREQ(part.Body(), "short");
  EXPECT_EQ(std::memchr(part.Body() + 5, 1, StreamPart::kStackSize - 5), nullptr);
}

TEST_F(StreamPartTest, EmptyPartIsRead) {
  PushParts({"", "next"});
  StreamPart empty;
  ASSERT_EQ(empty.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_EQ(empty.Length(), 0);
  StreamPart next;
  ASSERT_EQ(next.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_EQ(std::string(next.Body(), next.Length()), "next");
}

TEST_F(StreamPartTest, FailedHeaderReadIsNoHeader) {
  cam_.Handle(kPath, PushHandler({Push{{}, Push::kClose}}));
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart part;
  EXPECT_EQ(part.Read(fetch_.get(), false), StreamPart::kNoHeader);
}

TEST_F(StreamPartTest, BodyCutShortIsNoBody) {
  cam_.Handle(kPath, [](evsim::HttpConnection& c) {
    evtest::MultipartWriter w(c);
    w.Begin();
    w.Raw("--myboundary\r\nContent-Length: 3000\r\n\r\nonly this much");
  });
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart part;
  EXPECT_EQ(part.Read(fetch_.get(), false), StreamPart::kNoBody);
  EXPECT_FALSE(part.OnHeap()) << "the heap buffer goes with the failed read";
}

}  // namespace
