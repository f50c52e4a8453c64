#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "framework/host/fetcher.h"
#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"
#include "tests/support/fakecamera.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

std::string Head(const std::string& content_type) {
  return "HTTP/1.1 200 OK\r\nContent-Type: " + content_type + "\r\nConnection: close\r\n\r\n";
}

// A camera that writes `bytes` and then keeps the stream open.
evtest::FakeCamera::Handler Push(std::string bytes) {
  return [bytes](evsim::HttpConnection& connection) {
    if (connection.Write(bytes)) connection.SleepFor(seconds(30));
  };
}

std::unique_ptr<MultipartFetch> Fetch(const evtest::FakeCamera& camera, const char* path,
                                      int timeout = 5, const char* user = "",
                                      const char* password = "") {
  return std::make_unique<MultipartFetch>("127.0.0.1", camera.Port(), path, user, password,
                                          timeout);
}

struct Part {
  int length = -1;
  std::string header;
  std::string body;
};

// Reads one part whole; false when the header or the body read fails.
bool ReadPart(MultipartFetch& fetch, Part* part, int header_size = 128) {
  std::vector<char> header(header_size, 'x');
  if (fetch.ReadPartHeader(&part->length, header.data(), header_size) != 0) return false;
  part->header = header.data();
  part->body.assign(part->length, '\0');
  return fetch.ReadPartBody(part->body.data(), part->length) == 0;
}

TEST(MultipartFetchTest, ReadsPartsWithContentLength) {
  const std::string binary("\xff\xd8\r\n--myboundary\r\n\x00\n\xff\xd9", 21);
  evtest::FakeCamera camera;
  camera.Handle("/axis-cgi/motion.cgi", [&binary](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection);
    writer.Begin();
    writer.Part("text/plain", "group=0;level=10;threshold=5;\r\n");
    writer.Part("image/jpeg", binary);
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "axis-cgi/motion.cgi");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.length, 31);
  EXPECT_EQ(part.body, "group=0;level=10;threshold=5;\r\n");
  EXPECT_EQ(part.header, "Content-Type: text/plain\r\nContent-Length: 31\r\n");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.length, static_cast<int>(binary.size()));
  EXPECT_EQ(part.body, binary);  // a boundary-like line inside a counted body is body
  EXPECT_EQ(camera.Targets(), (std::vector<std::string>{"/axis-cgi/motion.cgi"}));
}

TEST(MultipartFetchTest, ReadsPartsWithoutContentLength) {
  evtest::FakeCamera camera;
  camera.Handle("/s", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection);
    writer.Begin();
    writer.Part("text/plain", "line1\r\nline2\r\n", false);
    writer.Part("text/plain", "", false);
    writer.Part("text/plain", "--myboundaryX\r\n--myboundary is not alone", false);
    writer.Part("text/plain", "next", false);
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/s");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "line1\r\nline2\r\n");
  EXPECT_EQ(part.length, 14);
  EXPECT_EQ(part.header, "Content-Type: text/plain\r\n");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.length, 0);
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "--myboundaryX\r\n--myboundary is not alone");
}

TEST(MultipartFetchTest, BoundaryParameterMayCarryDashes) {
  evtest::FakeCamera camera;
  // The parameter already holds "--" and the camera writes it as the delimiter line.
  camera.Handle("/a", Push(Head("multipart/x-mixed-replace; boundary=--frame") +
                           "--frame\r\nContent-Length: 3\r\n\r\none\r\n"
                           "--frame\r\n\r\ntwo\r\n--frame\r\n"));
  // The same parameter, delimiter written by the rule: "--" before it.
  camera.Handle("/b", Push(Head("multipart/x-mixed-replace;boundary=--frame") +
                           "----frame\r\nContent-Length: 3\r\n\r\none\r\n"
                           "----frame\r\n\r\ntwo\r\n----frame\r\n"));
  for (const char* path : {"/a", "/b"}) {
    auto fetch = Fetch(camera, path);
    Part part;
    ASSERT_TRUE(ReadPart(*fetch, &part)) << path;
    EXPECT_EQ(part.body, "one");
    ASSERT_TRUE(ReadPart(*fetch, &part)) << path;
    EXPECT_EQ(part.body, "two");
  }
}

TEST(MultipartFetchTest, QuotedBoundaryAndOtherMultipartTypes) {
  evtest::FakeCamera camera;
  camera.Handle("/q", Push(Head("Multipart/Mixed; charset=x; BOUNDARY=\"my frame\"; x=1") +
                           "--my frame\r\nContent-Length: 2\r\n\r\nok\r\n--my frame\r\n"));
  auto fetch = Fetch(camera, "/q");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "ok");
}

TEST(MultipartFetchTest, MissingBoundaryParameterTakesFirstDelimiterLine) {
  evtest::FakeCamera camera;
  camera.Handle("/n", Push(Head("multipart/x-mixed-replace") +
                           "preamble\r\n--xyz\r\nContent-Length: 2\r\n\r\nhi\r\n"
                           "--xyz\r\n\r\n--abc\r\n--xyz\r\n"));
  auto fetch = Fetch(camera, "/n");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "hi");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "--abc");
}

TEST(MultipartFetchTest, LfOnlyStream) {
  evtest::FakeCamera camera;
  camera.Handle("/lf", Push(Head("multipart/x-mixed-replace;boundary=b") +
                            "--b\nContent-Type: text/plain\nContent-Length: 3\n\nabc\n"
                            "--b\ncontent-type: text/plain\n\nx\ny\n--b\n"));
  auto fetch = Fetch(camera, "/lf");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "abc");
  EXPECT_EQ(part.header, "Content-Type: text/plain\nContent-Length: 3\n");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "x\ny");
}

TEST(MultipartFetchTest, SkipsPreambleAndTextBeforeBoundary) {
  evtest::FakeCamera camera;
  camera.Handle("/p", Push(Head("multipart/x-mixed-replace;boundary=b") +
                           "This is a preamble.\r\n--b-not-yet\r\n\r\n--b\r\n"
                           "content-length: 4\r\n\r\nbody\r\njunk between parts\r\n--b\r\n"
                           "Content-Length: 5\r\n\r\nsecond\r\n"));
  auto fetch = Fetch(camera, "/p");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "body");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "secon");
}

TEST(MultipartFetchTest, TextBeforeAndAfterBody) {
  evtest::FakeCamera camera;
  camera.Handle("/t", Push(Head("multipart/x-mixed-replace;boundary=b") +
                           "--b\r\nContent-Type: image/jpeg\r\nmotion-event: 1\r\n"
                           "Content-Length: 4\r\n\r\nJPEG\r\nPragma: trigger=motion\r\n\r\n"
                           "--b\r\nContent-Length: 2\r\n\r\nJ2\r\n--b\r\n"
                           "Content-Length: 2\r\n\r\nJ3\r\n--b\r\n"));
  auto fetch = Fetch(camera, "/t");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "JPEG");
  unsigned char text[MultipartFetch::kOptContentSize];
  ASSERT_EQ(fetch->FetchFrontOptContent(text), 0);
  EXPECT_STREQ(reinterpret_cast<char*>(text),
               "Content-Type: image/jpeg\r\nmotion-event: 1\r\nContent-Length: 4\r\n");
  ASSERT_EQ(fetch->FetchBackOptContent(text), 0);
  EXPECT_STREQ(reinterpret_cast<char*>(text), "Pragma: trigger=motion\r\n\r\n");
  ASSERT_EQ(fetch->FetchBackOptContent(text), 0);  // asked again: the same text
  EXPECT_STREQ(reinterpret_cast<char*>(text), "Pragma: trigger=motion\r\n\r\n");
  // The boundary that ended the trailing text is not looked for again.
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "J2");
  ASSERT_EQ(fetch->FetchBackOptContent(text), 0);
  EXPECT_STREQ(reinterpret_cast<char*>(text), "");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "J3");
}

TEST(MultipartFetchTest, OptContentIsCut) {
  const std::string long_line(3000, 'h');
  evtest::FakeCamera camera;
  camera.Handle("/c", Push(Head("multipart/x-mixed-replace;boundary=b") + "--b\r\nX-Long: " +
                           long_line + "\r\nContent-Length: 1\r\n\r\nB\r\n" + long_line +
                           "\r\n--b\r\n"));
  auto fetch = Fetch(camera, "/c");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part, 256));
  EXPECT_EQ(part.header.size(), 255u);
  std::vector<unsigned char> text(MultipartFetch::kOptContentSize + 16, 'z');
  ASSERT_EQ(fetch->FetchFrontOptContent(text.data()), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(text.data())),
            ("X-Long: " + long_line).substr(0, MultipartFetch::kOptContentSize - 1));
  ASSERT_EQ(fetch->FetchBackOptContent(text.data()), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(text.data())),
            long_line.substr(0, MultipartFetch::kOptContentSize - 1));
  EXPECT_EQ(text[MultipartFetch::kOptContentSize], 'z');
}

TEST(MultipartFetchTest, HeaderIsCutToBuffer) {
  evtest::FakeCamera camera;
  camera.Handle("/h", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Part("text/plain", "payload");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/h");
  char header[17];
  std::fill(std::begin(header), std::end(header), 'x');
  int length = 0;
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, 16), 0);
  EXPECT_EQ(std::string(header), "Content-Type: t");
  EXPECT_EQ(header[16], 'x');
  EXPECT_EQ(length, 7);
  char body[7];
  ASSERT_EQ(fetch->ReadPartBody(body, 7), 0);
  EXPECT_EQ(std::string(body, 7), "payload");
}

TEST(MultipartFetchTest, SkipContentPassesOverRestOfPart) {
  evtest::FakeCamera camera;
  camera.Handle("/k", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Part("application/octet-stream", std::string(100000, 'a'));
    writer.Part("text/plain", "second");
    writer.Part("text/plain", "0123456789");
    writer.Part("text/plain", "fourth");
    writer.Part("text/plain", "fifth", false);
    writer.Part("text/plain", "sixth");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/k");
  char header[128];
  int length = 0;
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  EXPECT_EQ(length, 100000);
  char scratch[16];
  EXPECT_EQ(fetch->SkipContent(scratch, sizeof(scratch)), 0);
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "second");
  // Part read in part, then skipped.
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  ASSERT_EQ(fetch->ReadPartBody(scratch, 4), 0);
  EXPECT_EQ(std::string(scratch, 4), "0123");
  EXPECT_EQ(fetch->SkipContent(scratch, sizeof(scratch)), 0);
  // Part not read at all and not skipped: the next header read passes over it.
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "fifth");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "sixth");
  EXPECT_EQ(camera.Count("/k"), 1);
}

TEST(MultipartFetchTest, BodyReadArgumentsAreChecked) {
  evtest::FakeCamera camera;
  camera.Handle("/r", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Part("text/plain", "abc");
    writer.Part("text/plain", "def", false);
    writer.Part("text/plain", "ghi");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/r");
  char body[8];
  EXPECT_NE(fetch->ReadPartBody(body, 1), 0);  // no part yet
  char header[128];
  int length = 0;
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  EXPECT_EQ(fetch->ReadPartBody(body, 0), 0);
  EXPECT_NE(fetch->ReadPartBody(body, 4), 0);  // more than the part holds
  EXPECT_NE(fetch->ReadPartBody(body, -1), 0);
  ASSERT_EQ(fetch->ReadPartBody(body, 3), 0);
  EXPECT_EQ(std::string(body, 3), "abc");
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  EXPECT_NE(fetch->ReadPartBody(body, 4), 0);
  ASSERT_EQ(fetch->ReadPartBody(body, 3), 0);
  EXPECT_EQ(std::string(body, 3), "def");
  EXPECT_NE(fetch->ReadPartHeader(nullptr, header, sizeof(header)), 0);
  EXPECT_NE(fetch->ReadPartHeader(&length, nullptr, 1), 0);
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "ghi");
}

TEST(MultipartFetchTest, OversizePartIsRefusedAndStreamReopened) {
  std::atomic<int> connections{0};
  evtest::FakeCamera camera;
  camera.Handle("/big", [&connections](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    if (connections++ == 0) {
      writer.Raw("--b\r\nContent-Type: image/jpeg\r\nContent-Length: " +
                 std::to_string(MultipartFetch::kMaxPartLength + 1) + "\r\n\r\nxxxx");
    } else {
      writer.Part("text/plain", "small");
    }
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/big");
  char header[128];
  int length = 0;
  EXPECT_NE(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  char scratch[4];
  EXPECT_EQ(fetch->SkipContent(scratch, sizeof(scratch)), 0);
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "small");
  EXPECT_EQ(camera.Count("/big"), 2);
}

TEST(MultipartFetchTest, HugeLengthTextIsRefused) {
  evtest::FakeCamera camera;
  camera.Handle("/huge", Push(Head("multipart/x-mixed-replace;boundary=b") +
                              "--b\r\nContent-Length: 99999999999999999999999\r\n\r\nxx"));
  camera.Handle("/neg", Push(Head("multipart/x-mixed-replace;boundary=b") +
                             "--b\r\nContent-Length: -5\r\n\r\nxx"));
  for (const char* path : {"/huge", "/neg"}) {
    auto fetch = Fetch(camera, path);
    char header[128];
    int length = 0;
    EXPECT_NE(fetch->ReadPartHeader(&length, header, sizeof(header)), 0) << path;
  }
}

TEST(MultipartFetchTest, OversizeUncountedPartIsRefused) {
  evtest::FakeCamera camera;
  camera.Handle("/flood", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Raw("--b\r\nContent-Type: text/plain\r\n\r\n");
    const std::string block(64 * 1024, 'f');
    for (int i = 0; i < 200 && writer.Raw(block); ++i) {
    }
  });
  auto fetch = Fetch(camera, "/flood");
  char header[128];
  int length = 0;
  EXPECT_NE(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
}

TEST(MultipartFetchTest, LargePartsAreReadWhole) {
  std::string counted(3 * 1024 * 1024 + 7, '\0');
  for (size_t i = 0; i < counted.size(); ++i) counted[i] = static_cast<char>(i * 7 + (i >> 9));
  std::string uncounted(300000, 'u');
  for (size_t i = 0; i < uncounted.size(); i += 97) uncounted[i] = '\n';
  evtest::FakeCamera camera;
  camera.Handle("/l", [&](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Part("image/jpeg", counted);
    writer.Part("text/plain", uncounted, false);
    writer.Part("text/plain", "end");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/l");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_TRUE(part.body == counted);
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.length, static_cast<int>(uncounted.size()));
  EXPECT_TRUE(part.body == uncounted);
}

TEST(MultipartFetchTest, ReconnectsAfterCameraDropsStream) {
  std::atomic<int> connections{0};
  evtest::FakeCamera camera;
  camera.Handle("/d", [&connections](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    if (connections++ == 0) {
      writer.Part("text/plain", "A");
      return;  // the camera drops the stream
    }
    writer.Part("text/plain", "B");
    writer.Part("text/plain", "C");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/d");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "A");
  EXPECT_FALSE(ReadPart(*fetch, &part));  // the stream ended
  ASSERT_TRUE(ReadPart(*fetch, &part));   // a new request
  EXPECT_EQ(part.body, "B");
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "C");
  EXPECT_EQ(camera.Count("/d"), 2);
}

TEST(MultipartFetchTest, ReconnectsAfterBodyCutShort) {
  std::atomic<int> connections{0};
  evtest::FakeCamera camera;
  camera.Handle("/cut", [&connections](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    if (connections++ == 0) {
      writer.Raw("--b\r\nContent-Length: 100\r\n\r\nonly part of it");
      return;
    }
    writer.Part("text/plain", "whole");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/cut");
  char header[128];
  int length = 0;
  ASSERT_EQ(fetch->ReadPartHeader(&length, header, sizeof(header)), 0);
  EXPECT_EQ(length, 100);
  std::vector<char> body(100);
  EXPECT_NE(fetch->ReadPartBody(body.data(), 100), 0);
  char scratch[4];
  EXPECT_EQ(fetch->SkipContent(scratch, sizeof(scratch)), 0);
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "whole");
}

TEST(MultipartFetchTest, ClosingDelimiterEndsStream) {
  evtest::FakeCamera camera;
  camera.AnswerSequence("/e", {evtest::Raw(Head("multipart/mixed;boundary=b") +
                                           "--b\r\n\r\nfirst\r\n--b--\r\n"),
                               evtest::Raw(Head("multipart/mixed;boundary=b") +
                                           "--b\r\nContent-Length: 5\r\n\r\nagain\r\n--b--\r\n")});
  auto fetch = Fetch(camera, "/e");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "first");
  EXPECT_FALSE(ReadPart(*fetch, &part));
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "again");
}

TEST(MultipartFetchTest, SilentStreamTimesOut) {
  evtest::FakeCamera camera;
  camera.Answer("/quiet", evtest::HeadersThenSilence("multipart/x-mixed-replace;boundary=b",
                                                      seconds(30)));
  camera.Handle("/stall", Push(Head("multipart/x-mixed-replace;boundary=b") +
                               "--b\r\nContent-Length: 10\r\n\r\nabc"));
  auto quiet = Fetch(camera, "/quiet", 1);
  char header[128];
  int length = 0;
  EXPECT_NE(quiet->ReadPartHeader(&length, header, sizeof(header)), 0);
  auto stall = Fetch(camera, "/stall", 1);
  ASSERT_EQ(stall->ReadPartHeader(&length, header, sizeof(header)), 0);
  char body[10];
  EXPECT_NE(stall->ReadPartBody(body, 10), 0);
}

TEST(MultipartFetchTest, RefusedAnswersFail) {
  evtest::FakeCamera camera;
  camera.Answer("/text", evtest::Text("not a stream"));
  camera.Answer("/denied", evtest::Respond(403, "multipart/x-mixed-replace;boundary=b", ""));
  for (const char* path : {"/text", "/denied", "/missing"}) {
    auto fetch = Fetch(camera, path);
    char header[128];
    int length = 0;
    EXPECT_NE(fetch->ReadPartHeader(&length, header, sizeof(header)), 0) << path;
    unsigned char text[MultipartFetch::kOptContentSize];
    EXPECT_NE(fetch->FetchFrontOptContent(text), 0);
    EXPECT_NE(fetch->FetchBackOptContent(text), 0);
  }
}

TEST(MultipartFetchTest, AnswersDigestChallenge) {
  evtest::FakeCamera camera;
  camera.RequireAuth(evsim::AuthScheme::kDigest, "viewer", "p@ss:w%rd");
  camera.Handle("/Event/notification/alertStream", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "boundary");
    writer.Begin();
    writer.Part("application/xml", "<EventNotificationAlert/>");
    connection.SleepFor(seconds(30));
  });
  auto fetch = Fetch(camera, "/Event/notification/alertStream", 5, "viewer", "p@ss:w%rd");
  Part part;
  ASSERT_TRUE(ReadPart(*fetch, &part));
  EXPECT_EQ(part.body, "<EventNotificationAlert/>");
}

TEST(MultipartFetchTest, DeletingReaderClosesStream) {
  evtest::FakeCamera camera;
  std::atomic<bool> peer_closed{false};
  camera.Handle("/x", [&peer_closed](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection, "b");
    writer.Begin();
    writer.Part("text/plain", "one");
    for (int i = 0; i < 1000 && !connection.PeerClosed(); ++i) {
      if (!connection.SleepFor(milliseconds(10))) return;
    }
    peer_closed = connection.PeerClosed();
  });
  {
    auto fetch = Fetch(camera, "/x");
    Part part;
    ASSERT_TRUE(ReadPart(*fetch, &part));
  }
  for (int i = 0; i < 1000 && !peer_closed; ++i) std::this_thread::sleep_for(milliseconds(10));
  EXPECT_TRUE(peer_closed);
}

}  // namespace
