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

TEST_F(StreamPartTest, HeaderBufferSizeComesFromTheShape) {
  // One part header of about 300 characters: the plain reader keeps 127 of them, a reader
  // with a 256-byte header buffer 255.
  const std::string part =
      evtest::RawPart("md1=on\r\n", {"X-Long: " + std::string(260, 'h')});
  Push push{{part, part}};
  push.raw = true;
  cam_.Handle(kPath, PushHandler({push}));
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart plain;
  ASSERT_EQ(plain.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_EQ(std::strlen(plain.Header()), 127u);
  EXPECT_EQ(std::string(plain.Header(), 14), "Content-Type: ");
  StreamPart::Shape shape;
  shape.header_size = 256;
  StreamPart wide;
  ASSERT_EQ(wide.Read(fetch_.get(), shape), StreamPart::kRead);
  EXPECT_EQ(std::strlen(wide.Header()), 255u);
  EXPECT_EQ(std::string(wide.Body(), wide.Length()), "md1=on\r\n");
}

TEST_F(StreamPartTest, TextBeforeTheBodyIsJudgedUpToItsEnd) {
  Push push{{evtest::RawPart(std::string(40, 'b'), {"motion-event: 1"})}};
  push.raw = true;
  cam_.Handle(kPath, PushHandler({push}));
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart::Shape shape;
  shape.extra = StreamPart::Extra::kBefore;
  StreamPart part;
  ASSERT_EQ(part.Read(fetch_.get(), shape), StreamPart::kRead);
  const std::string front = "Content-Type: text/plain\r\nContent-Length: 40\r\nmotion-event: 1\r\n";
  EXPECT_EQ(part.JudgedLength(), static_cast<int>(front.size()));
  EXPECT_EQ(std::string(part.Body(), part.JudgedLength()), front);
}

TEST_F(StreamPartTest, TextAfterTheBodyOverwritesItsStartAndTheBodysLengthIsJudged) {
  Push push{{evtest::RawPart(std::string(40, 'b'), {}, "Pragma: trigger=motion\r\n"),
             evtest::RawPart("next")}};
  push.raw = true;
  cam_.Handle(kPath, PushHandler({push}));
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart::Shape shape;
  shape.extra = StreamPart::Extra::kAfter;
  StreamPart part;
  ASSERT_EQ(part.Read(fetch_.get(), shape), StreamPart::kRead);
  EXPECT_EQ(part.JudgedLength(), 40);
  const std::string trailer = "Pragma: trigger=motion\r\n";
  EXPECT_EQ(std::string(part.Body(), trailer.size() + 1), trailer + std::string(1, '\0'));
  EXPECT_EQ(part.Body()[trailer.size() + 1], 'b') << "the body behind the text stays";
  StreamPart next;
  ASSERT_EQ(next.Read(fetch_.get(), false), StreamPart::kRead);
  EXPECT_EQ(std::string(next.Body(), next.Length()), "next");
}

TEST_F(StreamPartTest, TextAfterABodyThatNeverEndsIsNoBody) {
  Push push{{evtest::RawPart("body", {}, "Pragma: trigger=motion\r\n")}, Push::kClose};
  push.raw = true;
  cam_.Handle(kPath, PushHandler({push}));
  fetch_ = FetchFrom(cam_, kPath);
  StreamPart::Shape shape;
  shape.extra = StreamPart::Extra::kAfter;
  StreamPart part;
  EXPECT_EQ(part.Read(fetch_.get(), shape), StreamPart::kNoBody);
}

}  // namespace
