#include "framework/host/httpclient.h"

#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <memory>
#include <string>
#include <thread>

#include <gtest/gtest.h>

#include "host/transport/httppull.h"

#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"
#include "tests/support/fakecamera.h"

namespace {

using std::chrono::milliseconds;

std::unique_ptr<VoHttpClient> Client(const evtest::FakeCamera& camera, const std::string& path,
                                     const std::string& user = "",
                                     const std::string& password = "", int timeout = 5) {
  return std::make_unique<VoHttpClient>("127.0.0.1", camera.Port(), path, user, password,
                                        timeout);
}

// Reads the whole body with ReadData in pieces of `piece` bytes.
std::string ReadAll(VoHttpClient& client, int piece = 4096) {
  std::string body;
  std::string buffer(piece, '\0');
  for (;;) {
    int n = client.ReadData(buffer.data(), piece);
    if (n <= 0) return body;
    body.append(buffer.data(), n);
  }
}

// A port on loopback where nothing listens: bound, never listening, so connects are refused.
class RefusingPort {
 public:
  RefusingPort() {
    fd_ = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    bind(fd_, reinterpret_cast<sockaddr*>(&address), sizeof(address));
    socklen_t length = sizeof(address);
    getsockname(fd_, reinterpret_cast<sockaddr*>(&address), &length);
    port_ = ntohs(address.sin_port);
  }
  ~RefusingPort() { close(fd_); }
  int Port() const { return port_; }

 private:
  int fd_;
  int port_;
};

TEST(VoHttpClientTest, GetsBodyAndContentTypeForPathWithoutLeadingSlash) {
  evtest::FakeCamera camera;
  camera.Answer("/axis-cgi/io/input.cgi?checkactive=1", evtest::Text("input1=active\r\n"));
  auto client = Client(camera, "axis-cgi/io/input.cgi?checkactive=1");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = -1;
  EXPECT_EQ(client->CheckResponse(status), 0);
  EXPECT_EQ(status, 200);
  std::string type;
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_TYPE, type), 0);
  EXPECT_EQ(type, "text/plain");
  EXPECT_EQ(ReadAll(*client), "input1=active\r\n");
  EXPECT_EQ(camera.Targets(), (std::vector<std::string>{"/axis-cgi/io/input.cgi?checkactive=1"}));
}

TEST(VoHttpClientTest, PathWithLeadingSlashIsRequestedAsGiven) {
  evtest::FakeCamera camera;
  camera.Answer("/cgi-bin/status", evtest::Text("ok"));
  auto client = Client(camera, "/cgi-bin/status");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  EXPECT_EQ(ReadAll(*client), "ok");
  EXPECT_EQ(camera.Targets(), (std::vector<std::string>{"/cgi-bin/status"}));
}

TEST(VoHttpClientTest, EmptyPathIsTheRoot) {
  evtest::FakeCamera camera;
  camera.Answer("/", evtest::Text("root"));
  auto client = Client(camera, "");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  EXPECT_EQ(ReadAll(*client), "root");
}

TEST(VoHttpClientTest, QueryGoesAsItIs) {
  const std::string target = "/cgi/q.cgi?name=a%20b&list=1,2&t=x+y&path=/a/b&e=&k==v";
  evtest::FakeCamera camera;
  camera.Answer(target, evtest::Text("q"));
  auto client = Client(camera, target.substr(1));
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  EXPECT_EQ(camera.Targets(), (std::vector<std::string>{target}));
}

TEST(VoHttpClientTest, NotFoundIsRejectedWithItsStatus) {
  evtest::FakeCamera camera;
  auto client = Client(camera, "missing.cgi");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), -1);
  EXPECT_EQ(status, 404);
}

TEST(VoHttpClientTest, ServerErrorAndRedirectAreRejected) {
  evtest::FakeCamera camera;
  camera.Answer("/err", evtest::Respond(500, "text/plain", "boom"));
  camera.Answer("/moved", evtest::Respond(302, "text/plain", "", {"Location: /err"}));
  for (const auto& [path, expected] : {std::pair<std::string, int>{"err", 500}, {"moved", 302}}) {
    auto client = Client(camera, path);
    ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
    int status = 0;
    EXPECT_EQ(client->CheckResponse(status), -1);
    EXPECT_EQ(status, expected);
  }
  EXPECT_EQ(camera.Count("/err"), 1);  // the redirect was not followed
}

TEST(VoHttpClientTest, AnswersBasicChallenge) {
  evtest::FakeCamera camera;
  camera.RequireAuth(evsim::AuthScheme::kBasic, "admin", "secret");
  camera.Answer("/a.cgi", evtest::Text("fine"));
  auto client = Client(camera, "a.cgi", "admin", "secret");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
  EXPECT_EQ(status, 200);
  EXPECT_EQ(ReadAll(*client), "fine");
  auto requests = camera.Requests();
  ASSERT_FALSE(requests.empty());
  EXPECT_EQ(requests.back().Header("Authorization").substr(0, 6), "Basic ");
  // Credentials travel only in the Authorization header.
  EXPECT_EQ(requests.back().Header("Host"), "127.0.0.1:" + std::to_string(camera.Port()));
  EXPECT_EQ(requests.back().target, "/a.cgi");
}

TEST(VoHttpClientTest, AnswersDigestChallenge) {
  evtest::FakeCamera camera;
  camera.RequireAuth(evsim::AuthScheme::kDigest, "admin", "secret");
  camera.Answer("/a.cgi?x=1", evtest::Text("fine"));
  auto client = Client(camera, "a.cgi?x=1", "admin", "secret");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
  EXPECT_EQ(status, 200);
  EXPECT_EQ(ReadAll(*client), "fine");
  auto requests = camera.Requests();
  ASSERT_FALSE(requests.empty());
  EXPECT_EQ(requests.back().Header("Authorization").substr(0, 7), "Digest ");
}

TEST(VoHttpClientTest, WrongPasswordGives401) {
  for (auto scheme : {evsim::AuthScheme::kBasic, evsim::AuthScheme::kDigest}) {
    evtest::FakeCamera camera;
    camera.RequireAuth(scheme, "admin", "secret");
    camera.Answer("/a.cgi", evtest::Text("fine"));
    auto client = Client(camera, "a.cgi", "admin", "wrong");
    ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
    int status = 0;
    EXPECT_EQ(client->CheckResponse(status), -1);
    EXPECT_EQ(status, 401);
  }
}

TEST(VoHttpClientTest, NoCredentialsGives401) {
  evtest::FakeCamera camera;
  camera.RequireAuth(evsim::AuthScheme::kDigest, "admin", "secret");
  auto client = Client(camera, "a.cgi");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), -1);
  EXPECT_EQ(status, 401);
}

TEST(VoHttpClientTest, CredentialsMayHoldAnyCharacter) {
  const std::string user = "op@r%41t\xc3\xb6r";            // '@', '%', UTF-8
  const std::string password = "p:a@s%2Fs w\xc3\xb6rd:";  // ':', '@', '%', blank, UTF-8
  for (auto scheme : {evsim::AuthScheme::kBasic, evsim::AuthScheme::kDigest}) {
    evtest::FakeCamera camera;
    camera.RequireAuth(scheme, user, password);
    camera.Answer("/a.cgi", evtest::Text("fine"));
    auto client = Client(camera, "a.cgi", user, password);
    ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
    int status = 0;
    EXPECT_EQ(client->CheckResponse(status), 0) << "scheme " << static_cast<int>(scheme);
    EXPECT_EQ(status, 200);
    EXPECT_EQ(ReadAll(*client), "fine");
  }
}

TEST(VoHttpClientTest, DigestUserNameMayHoldColon) {
  evtest::FakeCamera camera;
  camera.RequireAuth(evsim::AuthScheme::kDigest, "dom:user", "pw");
  camera.Answer("/a.cgi", evtest::Text("fine"));
  auto client = Client(camera, "a.cgi", "dom:user", "pw");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
}

TEST(VoHttpClientTest, ReachesIpv6Literal) {
  evsim::HttpServer server([](evsim::HttpConnection& connection) {
    connection.Write(evsim::MakeResponse(200, "text/plain", connection.Request().target));
  }, "::1");
  if (server.Port() <= 0) GTEST_SKIP() << "::1 is not available";
  for (const std::string host : {"::1", "[::1]"}) {
    VoHttpClient client(host, server.Port(), "six.cgi?a=1", "", "", 5);
    ASSERT_EQ(client.SendRequest(VO_HTTP_GET), 0) << host;
    int status = 0;
    EXPECT_EQ(client.CheckResponse(status), 0);
    EXPECT_EQ(ReadAll(client), "/six.cgi?a=1");
  }
}

TEST(VoHttpClientTest, ReachesHostByName) {
  evtest::FakeCamera camera;
  camera.Answer("/n", evtest::Text("named"));
  VoHttpClient client("localhost", camera.Port(), "n", "", "", 5);
  ASSERT_EQ(client.SendRequest(VO_HTTP_GET), 0);
  EXPECT_EQ(ReadAll(client), "named");
}

TEST(VoHttpClientTest, DecodesChunkedBody) {
  evtest::FakeCamera camera;
  camera.Answer("/c", evtest::Respond(200, "text/plain", "line one\nline two\n", {}, true));
  auto client = Client(camera, "c");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char line[64];
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 8);
  EXPECT_STREQ(line, "line one");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 8);
  EXPECT_STREQ(line, "line two");
  EXPECT_LT(client->ReadToLineEnd(line, sizeof(line)), 0);
}

TEST(VoHttpClientTest, ChunkedBodyReadWhole) {
  std::string body(10000, 'x');
  for (size_t i = 0; i < body.size(); i += 7) body[i] = static_cast<char>('a' + i % 26);
  evtest::FakeCamera camera;
  camera.Answer("/c", evtest::Respond(200, "application/octet-stream", body, {}, true));
  auto client = Client(camera, "c");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  std::string got(20000, '\0');
  int n = client->ReadData(got.data(), static_cast<int>(got.size()));
  ASSERT_EQ(n, static_cast<int>(body.size()));
  EXPECT_EQ(got.substr(0, n), body);
  EXPECT_EQ(client->ReadData(got.data(), 10), 0);
}

TEST(VoHttpClientTest, HeaderLookupIgnoresCase) {
  evtest::FakeCamera camera;
  camera.Answer("/h", evtest::Raw("HTTP/1.1 200 OK\r\ncontent-TYPE:   text/xml; charset=utf-8  \r\n"
                                  "Content-Length: 2\r\nConnection: close\r\n\r\nok"));
  auto client = Client(camera, "h");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  std::string type;
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_TYPE, type), 0);
  EXPECT_EQ(type, "text/xml; charset=utf-8");
  std::string length;
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_LENGTH, length), 0);
  EXPECT_EQ(length, "2");
}

TEST(VoHttpClientTest, MissingContentTypeIsNotFound) {
  evtest::FakeCamera camera;
  camera.Answer("/h", evtest::Raw("HTTP/1.1 200 OK\r\nContent-Length: 2\r\n"
                                  "Connection: close\r\n\r\nok"));
  auto client = Client(camera, "h");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  std::string type = "unchanged";
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_TYPE, type), -1);
  EXPECT_EQ(type, "unchanged");
}

TEST(VoHttpClientTest, InterimResponseIsSkipped) {
  evtest::FakeCamera camera;
  camera.Answer("/i", evtest::Raw("HTTP/1.1 100 Continue\r\nX-Interim: yes\r\n\r\n"
                                  "HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n"
                                  "Content-Length: 5\r\nConnection: close\r\n\r\nfinal"));
  auto client = Client(camera, "i");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
  EXPECT_EQ(status, 200);
  std::string value;
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_TYPE, value), 0);
  EXPECT_EQ(value, "text/plain");
  EXPECT_EQ(ReadAll(*client), "final");
}

TEST(VoHttpClientTest, EndlessHeadersFail) {
  evtest::FakeCamera camera;
  camera.Handle("/junk", [](evsim::HttpConnection& connection) {
    if (!connection.Write("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n")) return;
    const std::string line = "X-Junk: " + std::string(1000, 'j') + "\r\n";
    for (int i = 0; i < 100000 && connection.Write(line); ++i) {
    }
  });
  auto client = Client(camera, "junk");
  EXPECT_EQ(client->SendRequest(VO_HTTP_GET), -1);
  int status = -1;
  EXPECT_EQ(client->CheckResponse(status), -1);
}

TEST(VoHttpClientTest, ReadDataFillsAcrossDelayedSegments) {
  evtest::FakeCamera camera;
  camera.Handle("/slow", [](evsim::HttpConnection& connection) {
    connection.Write("HTTP/1.1 200 OK\r\nContent-Type: application/octet-stream\r\n"
                     "Content-Length: 48\r\nConnection: close\r\n\r\n");
    for (int i = 0; i < 4; ++i) {
      connection.SleepFor(milliseconds(60));
      connection.Write(std::string(12, static_cast<char>('a' + i)));
    }
  });
  auto client = Client(camera, "slow");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char buffer[48];
  ASSERT_EQ(client->ReadData(buffer, 48), 48);
  EXPECT_EQ(std::string(buffer, 48), std::string(12, 'a') + std::string(12, 'b') +
                                         std::string(12, 'c') + std::string(12, 'd'));
  EXPECT_EQ(client->ReadData(buffer, 48), 0);
}

TEST(VoHttpClientTest, ReadDataStopsAtBodyEnd) {
  evtest::FakeCamera camera;
  camera.Answer("/b", evtest::Binary(std::string("\x01\x02\x00\x04", 4)));
  auto client = Client(camera, "b");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char buffer[16];
  ASSERT_EQ(client->ReadData(buffer, 16), 4);
  EXPECT_EQ(std::string(buffer, 4), std::string("\x01\x02\x00\x04", 4));
  EXPECT_EQ(client->ReadData(buffer, 16), 0);
  EXPECT_EQ(client->ReadData(buffer, 0), 0);
}

TEST(VoHttpClientTest, LargeBodyReadInPieces) {
  std::string body(3 * 1024 * 1024, '\0');
  for (size_t i = 0; i < body.size(); ++i) body[i] = static_cast<char>((i * 131) >> 3);
  evtest::FakeCamera camera;
  camera.Answer("/big", evtest::Binary(body));
  auto client = Client(camera, "big");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  std::string got = ReadAll(*client, 1000);
  ASSERT_EQ(got.size(), body.size());
  EXPECT_TRUE(got == body);
}

TEST(VoHttpClientTest, ReadsLinesWithEitherLineEnd) {
  evtest::FakeCamera camera;
  camera.Answer("/l", evtest::Text("one\ntwo\r\n\r\nfour\n\nlast"));
  auto client = Client(camera, "l");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char line[32];
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "one");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "two");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 0);
  EXPECT_STREQ(line, "");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "four");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 0);
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "last");
  EXPECT_LT(client->ReadToLineEnd(line, sizeof(line)), 0);
  EXPECT_LT(client->ReadToLineEnd(line, sizeof(line)), 0);
}

TEST(VoHttpClientTest, LongLineIsCutAndContinues) {
  evtest::FakeCamera camera;
  camera.Answer("/l", evtest::Text("abcdefghij\r\nxyz\r\nfull\r\nend"));
  auto client = Client(camera, "l");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char line[5];
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "abcd");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "efgh");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 2);
  EXPECT_STREQ(line, "ij");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "xyz");
  // Exactly as long as the buffer allows: a whole line, not a cut one.
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  EXPECT_STREQ(line, "full");
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 3);
  EXPECT_STREQ(line, "end");
  EXPECT_LT(client->ReadToLineEnd(line, sizeof(line)), 0);
}

TEST(VoHttpClientTest, LinesAndDataMix) {
  evtest::FakeCamera camera;
  camera.Answer("/m", evtest::Text("head\r\nBODY"));
  auto client = Client(camera, "m");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char line[16];
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 4);
  char data[16];
  ASSERT_EQ(client->ReadData(data, sizeof(data)), 4);
  EXPECT_EQ(std::string(data, 4), "BODY");
}

TEST(VoHttpClientTest, SilentCameraMakesReadsGiveUp) {
  evtest::FakeCamera camera;
  camera.Answer("/quiet", evtest::HeadersThenSilence("text/plain", std::chrono::seconds(30)));
  auto client = Client(camera, "quiet", "", "", 1);
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
  char buffer[64];
  EXPECT_LT(client->ReadData(buffer, sizeof(buffer)), 0);
  EXPECT_LT(client->ReadToLineEnd(buffer, sizeof(buffer)), 0);
}

TEST(VoHttpClientTest, PartialDataThenSilenceReturnsWhatCame) {
  evtest::FakeCamera camera;
  camera.Handle("/trickle", [](evsim::HttpConnection& connection) {
    connection.Write("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n"
                     "Content-Length: 100\r\nConnection: close\r\n\r\nfirst");
    connection.SleepFor(std::chrono::seconds(30));
  });
  auto client = Client(camera, "trickle", "", "", 1);
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char buffer[100];
  ASSERT_EQ(client->ReadData(buffer, sizeof(buffer)), 5);
  EXPECT_EQ(std::string(buffer, 5), "first");
  EXPECT_LT(client->ReadData(buffer, sizeof(buffer)), 0);
}

TEST(VoHttpClientTest, SilentCameraMakesSendRequestFail) {
  evtest::FakeCamera camera;
  camera.Handle("/mute", [](evsim::HttpConnection& connection) {
    connection.SleepFor(std::chrono::seconds(30));
  });
  auto client = Client(camera, "mute", "", "", 1);
  EXPECT_EQ(client->SendRequest(VO_HTTP_GET), -1);
  int status = -1;
  EXPECT_EQ(client->CheckResponse(status), -1);
  EXPECT_EQ(status, 0);
}

TEST(VoHttpClientTest, BodyCutShortFails) {
  evtest::FakeCamera camera;
  camera.Answer("/cut", evtest::Raw("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n"
                                    "Content-Length: 100\r\nConnection: close\r\n\r\nshort"));
  auto client = Client(camera, "cut");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char buffer[100];
  ASSERT_EQ(client->ReadData(buffer, 3), 3);  // bytes that did come are served
  EXPECT_EQ(std::string(buffer, 3), "sho");
  EXPECT_LT(client->ReadData(buffer, sizeof(buffer)), 0);
  EXPECT_LT(client->ReadToLineEnd(buffer, sizeof(buffer)), 0);
}

TEST(VoHttpClientTest, CutShortLineFails) {
  evtest::FakeCamera camera;
  camera.Answer("/cut", evtest::Raw("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n"
                                    "Content-Length: 100\r\nConnection: close\r\n\r\nok\nhalf"));
  auto client = Client(camera, "cut");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char line[32];
  EXPECT_EQ(client->ReadToLineEnd(line, sizeof(line)), 2);
  EXPECT_LT(client->ReadToLineEnd(line, sizeof(line)), 0);
}

TEST(VoHttpClientTest, ConnectionRefused) {
  RefusingPort port;
  VoHttpClient client("127.0.0.1", port.Port(), "a.cgi", "u", "p", 2);
  EXPECT_EQ(client.SendRequest(VO_HTTP_GET), -1);
  int status = -1;
  EXPECT_EQ(client.CheckResponse(status), -1);
  EXPECT_EQ(status, 0);
  std::string type;
  EXPECT_EQ(client.GetHttpContent(HTTP_CONTENT_TYPE, type), -1);
  char buffer[16];
  EXPECT_LT(client.ReadData(buffer, sizeof(buffer)), 0);
  EXPECT_LT(client.ReadToLineEnd(buffer, sizeof(buffer)), 0);
}

TEST(VoHttpClientTest, UnresolvableHostFails) {
  VoHttpClient client("no-such-host.invalid", 80, "a.cgi", "", "", 2);
  EXPECT_EQ(client.SendRequest(VO_HTTP_GET), -1);
}

TEST(VoHttpClientTest, OperationsBeforeSendRequestFail) {
  evtest::FakeCamera camera;
  auto client = Client(camera, "a.cgi");
  int status = -1;
  EXPECT_EQ(client->CheckResponse(status), -1);
  EXPECT_EQ(status, 0);
  std::string type;
  EXPECT_EQ(client->GetHttpContent(HTTP_CONTENT_TYPE, type), -1);
  char buffer[16];
  EXPECT_LT(client->ReadData(buffer, sizeof(buffer)), 0);
  EXPECT_LT(client->ReadToLineEnd(buffer, sizeof(buffer)), 0);
  EXPECT_EQ(camera.Requests().size(), 0u);
}

TEST(VoHttpClientTest, BadArgumentsFail) {
  evtest::FakeCamera camera;
  camera.Answer("/a", evtest::Text("x\n"));
  auto client = Client(camera, "a");
  EXPECT_EQ(client->SendRequest(static_cast<__tag_VO_HTTP_METHOD>(7)), -1);
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  EXPECT_EQ(client->SendRequest(VO_HTTP_GET), -1);  // one request per client
  char buffer[4];
  EXPECT_LT(client->ReadData(nullptr, 4), 0);
  EXPECT_LT(client->ReadData(buffer, -1), 0);
  EXPECT_LT(client->ReadToLineEnd(nullptr, 4), 0);
  EXPECT_LT(client->ReadToLineEnd(buffer, 1), 0);
  EXPECT_EQ(client->ReadToLineEnd(buffer, sizeof(buffer)), 1);
  EXPECT_EQ(camera.Count("/a"), 1);
}

TEST(VoHttpClientTest, HeadRequestHasNoBody) {
  evtest::FakeCamera camera;
  camera.Answer("/h", evtest::Raw("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\n"
                                  "Content-Length: 4\r\nConnection: close\r\n\r\n"));
  auto client = Client(camera, "h");
  ASSERT_EQ(client->SendRequest(VO_HTTP_HEAD), 0);
  int status = 0;
  EXPECT_EQ(client->CheckResponse(status), 0);
  char buffer[8];
  EXPECT_EQ(client->ReadData(buffer, sizeof(buffer)), 0);
  auto requests = camera.Requests();
  ASSERT_EQ(requests.size(), 1u);
  EXPECT_EQ(requests[0].method, "HEAD");
}

TEST(VoHttpClientTest, EndlessStreamIsReadAsItComes) {
  evtest::FakeCamera camera;
  camera.Handle("/stream", [](evsim::HttpConnection& connection) {
    connection.Write("HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\nConnection: close\r\n\r\n");
    std::string block(4096, 'z');
    for (int i = 0; i < 4096 && connection.Write(block); ++i) {
    }
  });
  auto client = Client(camera, "stream");
  ASSERT_EQ(client->SendRequest(VO_HTTP_GET), 0);
  char buffer[1000];
  long total = 0;
  for (int i = 0; i < 1000; ++i) {
    int n = client->ReadData(buffer, sizeof(buffer));
    ASSERT_EQ(n, 1000);
    total += n;
  }
  EXPECT_EQ(total, 1000000);
  EXPECT_EQ(buffer[999], 'z');
}

// The engine under the client: a reader that falls behind an endless stream does not make
// the buffer grow past its bound.
TEST(HttpPullTest, BufferStaysBoundedWhileReaderLags) {
  evtest::FakeCamera camera;
  camera.Handle("/flood", [](evsim::HttpConnection& connection) {
    connection.Write("HTTP/1.1 200 OK\r\nContent-Type: video/raw\r\nConnection: close\r\n\r\n");
    std::string block(64 * 1024, '\0');
    for (unsigned i = 0; i < 256; ++i) {
      for (size_t j = 0; j < block.size(); ++j) block[j] = static_cast<char>(i + j / 4096);
      if (!connection.Write(block)) return;
    }
  });
  HttpPull pull(HttpPull::Target{"127.0.0.1", camera.Port(), "flood", "", "", 5});
  ASSERT_TRUE(pull.Start(false));
  EXPECT_EQ(pull.Status(), 200);
  const size_t bound = HttpPull::kBufferBound + CURL_MAX_WRITE_SIZE;
  size_t total = 0;
  size_t most = 0;
  bool intact = true;
  for (int round = 0; round < 40; ++round) {
    std::this_thread::sleep_for(milliseconds(5));  // the camera runs ahead meanwhile
    if (pull.Fill(1) != HttpPull::Wait::kReady) break;
    most = std::max(most, pull.Buffered());
    for (size_t i = 0; i < pull.Buffered(); ++i) {
      size_t at = total + i;
      intact &= pull.Data()[i] == static_cast<char>(at / (64 * 1024) + (at % (64 * 1024)) / 4096);
    }
    total += pull.Buffered();
    pull.Consume(pull.Buffered());
  }
  EXPECT_TRUE(intact);
  EXPECT_LE(most, bound);
  EXPECT_GT(total, bound);
}

}  // namespace
