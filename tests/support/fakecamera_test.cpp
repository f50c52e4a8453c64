#include "tests/support/fakecamera.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <thread>

#include "tests/support/loopbackclient.h"

namespace evtest {
namespace {

using std::chrono::milliseconds;

TEST(FakeCameraTest, ServesScriptedAnswerByteForByte) {
  FakeCamera cam;
  ASSERT_GT(cam.Port(), 0);
  cam.Answer("/axis-cgi/io/input.cgi?checkactive=1", Text("input1=active\r\n"));

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/axis-cgi/io/input.cgi?checkactive=1")),
            "HTTP/1.1 200 OK\r\n"
            "Content-Type: text/plain\r\n"
            "Content-Length: 15\r\n"
            "Connection: close\r\n"
            "\r\n"
            "input1=active\r\n");
}

TEST(FakeCameraTest, ServesRawAndBinaryBytesAsTheyStand) {
  FakeCamera cam;
  const std::string binary("\x00\x01\xff\r\n\x7f", 6);
  cam.Answer("/raw", Raw("HTTP/1.0 200\nbroken header\n\ngarbage"));
  cam.Answer("/bin", Binary(binary));

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/raw")), "HTTP/1.0 200\nbroken header\n\ngarbage");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/bin")),
            "HTTP/1.1 200 OK\r\nContent-Type: application/octet-stream\r\nContent-Length: 6\r\n"
            "Connection: close\r\n\r\n" +
                binary);
}

TEST(FakeCameraTest, RespondCarriesStatusExtraHeadersAndChunkedBody) {
  FakeCamera cam;
  cam.Answer("/c", Respond(500, "text/html", "oops", {"X-Camera: one"}, true));

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/c")),
            "HTTP/1.1 500 Internal Server Error\r\nContent-Type: text/html\r\n"
            "Transfer-Encoding: chunked\r\nX-Camera: one\r\nConnection: close\r\n\r\n"
            "4\r\noops\r\n0\r\n\r\n");
}

TEST(FakeCameraTest, SequenceAnswersInOrderAndRepeatsTheLast) {
  FakeCamera cam;
  cam.AnswerSequence("/s", {Raw("first"), Raw("second"), Raw("last")});

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/s")), "first");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/s")), "second");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/s")), "last");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/s")), "last");
}

TEST(FakeCameraTest, UnscriptedTargetGets404AndQueryMustMatchExactly) {
  FakeCamera cam;
  cam.Answer("/x.cgi?a=1", Raw("yes"));

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/x.cgi?a=1")), "yes");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/x.cgi?a=2")).rfind("HTTP/1.1 404 Not Found\r\n", 0),
            0u);
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/x.cgi")).rfind("HTTP/1.1 404 Not Found\r\n", 0), 0u);
}

TEST(FakeCameraTest, LogsMethodTargetAndHeaders) {
  FakeCamera cam;
  cam.Answer("/a?b=c&d=e", Raw("ok"));

  Exchange(cam.Port(), GetRequest("/a?b=c&d=e", "X-Probe: 42\r\nUser-Agent: tester\r\n"));
  Exchange(cam.Port(), "POST /other HTTP/1.1\r\nContent-Length: 3\r\n\r\nabc");

  std::vector<SeenRequest> seen = cam.Requests();
  ASSERT_EQ(seen.size(), 2u);
  EXPECT_EQ(seen[0].method, "GET");
  EXPECT_EQ(seen[0].target, "/a?b=c&d=e");
  EXPECT_EQ(seen[0].Header("x-probe"), "42");
  EXPECT_EQ(seen[0].Header("USER-AGENT"), "tester");
  EXPECT_EQ(seen[0].Header("Absent"), "");
  ASSERT_EQ(seen[0].headers.size(), 3u);
  EXPECT_EQ(seen[0].headers[0], (std::pair<std::string, std::string>{"Host", "127.0.0.1"}));
  EXPECT_EQ(seen[1].method, "POST");
  EXPECT_EQ(cam.Targets(), (std::vector<std::string>{"/a?b=c&d=e", "/other"}));
  EXPECT_EQ(cam.Count("/a?b=c&d=e"), 1);
  EXPECT_EQ(cam.Count("/other"), 1);
  EXPECT_EQ(cam.Count("/a"), 0);

  cam.ClearLog();
  EXPECT_TRUE(cam.Requests().empty());
  EXPECT_EQ(cam.Count("/other"), 0);
}

TEST(FakeCameraTest, WaitForRequestsWaitsForLaterRequests) {
  FakeCamera cam;
  EXPECT_FALSE(cam.WaitForRequests(1, milliseconds(50)));

  std::thread client([&cam] {
    std::this_thread::sleep_for(milliseconds(50));
    for (int i = 0; i < 3; ++i) Exchange(cam.Port(), GetRequest("/w"));
  });
  EXPECT_TRUE(cam.WaitForRequests(3));
  client.join();
  EXPECT_EQ(cam.Count("/w"), 3);
}

TEST(FakeCameraTest, RecordPointsAtTheCamera) {
  FakeCamera cam;
  CameraRecord record = cam.Record("admin", "secret");
  EXPECT_EQ(record.host, "127.0.0.1");
  EXPECT_EQ(record.port, cam.Port());
  EXPECT_EQ(record.username, "admin");
  EXPECT_EQ(record.password, "secret");
}

TEST(FakeCameraTest, BasicAuthAcceptsRightCredentialsOnly) {
  FakeCamera cam;
  const std::string password = "pa:ss w\xc3\xb6rd";
  cam.RequireAuth(evsim::AuthScheme::kBasic, "admin", password);
  cam.Answer("/p", Raw("granted"));

  std::string refused = Exchange(cam.Port(), GetRequest("/p"));
  EXPECT_EQ(refused.rfind("HTTP/1.1 401 Unauthorized\r\n", 0), 0u);
  EXPECT_NE(refused.find("WWW-Authenticate: Basic realm=\"camera\"\r\n"), std::string::npos);

  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/p", BasicAuthorization("admin", password))),
            "granted");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/p", BasicAuthorization("admin", "pa:ss")))
                .rfind("HTTP/1.1 401", 0),
            0u);
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/p", BasicAuthorization("root", password)))
                .rfind("HTTP/1.1 401", 0),
            0u);
  EXPECT_EQ(cam.Count("/p"), 4);  // refused requests are logged too
}

TEST(FakeCameraTest, DigestAuthAcceptsComputedResponseAndRefusesWrongOne) {
  FakeCamera cam;
  cam.RequireAuth(evsim::AuthScheme::kDigest, "admin", "12:34");
  cam.Answer("/d.cgi?x=1", Raw("granted"));

  std::string challenge = Exchange(cam.Port(), GetRequest("/d.cgi?x=1"));
  ASSERT_EQ(challenge.rfind("HTTP/1.1 401 Unauthorized\r\n", 0), 0u);
  ASSERT_NE(challenge.find("WWW-Authenticate: Digest "), std::string::npos);

  EXPECT_EQ(Exchange(cam.Port(),
                     GetRequest("/d.cgi?x=1", DigestAuthorization(challenge, "GET", "/d.cgi?x=1",
                                                                  "admin", "12:34"))),
            "granted");
  EXPECT_EQ(Exchange(cam.Port(), GetRequest("/d.cgi?x=1",
                                            DigestAuthorization(challenge, "GET", "/d.cgi?x=1",
                                                                "admin", "12:34", false))),
            "granted");
  EXPECT_EQ(Exchange(cam.Port(),
                     GetRequest("/d.cgi?x=1", DigestAuthorization(challenge, "GET", "/d.cgi?x=1",
                                                                  "admin", "wrong")))
                .rfind("HTTP/1.1 401", 0),
            0u);
}

TEST(FakeCameraTest, MultipartPushArrivesPartByPart) {
  FakeCamera cam;
  std::promise<void> first_part_seen;
  std::future<void> go_on = first_part_seen.get_future();
  cam.Handle("/push", [&go_on](evsim::HttpConnection& connection) {
    MultipartWriter writer(connection, "frame");
    if (!writer.Begin() || !writer.Part("text/plain", "one")) return;
    go_on.wait_for(std::chrono::seconds(10));
    writer.Part("text/plain", "two", false);
    writer.Raw("--frame--\r\n");
  });

  LoopbackClient client(cam.Port());
  ASSERT_TRUE(client.Send(GetRequest("/push")));
  std::string head = client.ReadUntil("one\r\n");
  EXPECT_EQ(head,
            "HTTP/1.1 200 OK\r\nContent-Type: multipart/x-mixed-replace;boundary=frame\r\n"
            "Connection: close\r\n\r\n"
            "--frame\r\nContent-Type: text/plain\r\nContent-Length: 3\r\n\r\none\r\n");
  first_part_seen.set_value();
  EXPECT_EQ(client.ReadAll(), "--frame\r\nContent-Type: text/plain\r\n\r\ntwo\r\n--frame--\r\n");
}

TEST(FakeCameraTest, HeadersThenSilenceKeepsTheConnectionOpenWithoutData) {
  auto cam = std::make_unique<FakeCamera>();
  cam->Answer("/silent", HeadersThenSilence("multipart/x-mixed-replace;boundary=b",
                                            std::chrono::seconds(60)));
  LoopbackClient client(cam->Port());
  ASSERT_TRUE(client.Send(GetRequest("/silent")));
  EXPECT_EQ(client.ReadUntil("\r\n\r\n"),
            "HTTP/1.1 200 OK\r\nContent-Type: multipart/x-mixed-replace;boundary=b\r\n"
            "Connection: close\r\n\r\n");
  EXPECT_FALSE(client.WaitClosed(milliseconds(100)));
  EXPECT_EQ(client.ReadAll(milliseconds(10)), "");  // silence: nothing more came

  cam.reset();  // stopping ends the silence
  EXPECT_TRUE(client.WaitClosed());
}

TEST(FakeCameraTest, DelayedAnswerArrivesWholeAfterTheDelay) {
  FakeCamera cam;
  Reply slow = Text("late");
  slow.delay = milliseconds(300);
  cam.Answer("/slow", slow);

  LoopbackClient client(cam.Port());
  ASSERT_TRUE(client.Send(GetRequest("/slow")));
  EXPECT_EQ(client.ReadUntil("HTTP", milliseconds(20)), "");  // nothing before the delay
  EXPECT_EQ(client.ReadAll(), Text("late").bytes);
}

TEST(FakeCameraTest, HoldOpenKeepsConnectionAfterTheAnswer) {
  auto cam = std::make_unique<FakeCamera>();
  Reply held = Text("held");
  held.hold_open = std::chrono::seconds(60);
  cam->Answer("/held", held);

  LoopbackClient client(cam->Port());
  ASSERT_TRUE(client.Send(GetRequest("/held")));
  EXPECT_EQ(client.ReadUntil("held"), held.bytes);
  EXPECT_FALSE(client.WaitClosed(milliseconds(100)));
  cam.reset();
  EXPECT_TRUE(client.WaitClosed());
}

TEST(FakeCameraTest, DestructionStopsHandlerInTheMiddleOfAPush) {
  std::atomic<bool> returned{false};
  std::atomic<int> parts{0};
  auto cam = std::make_unique<FakeCamera>();
  cam->Handle("/endless", [&](evsim::HttpConnection& connection) {
    MultipartWriter writer(connection);
    writer.Begin();
    while (writer.Part("image/jpeg", std::string(1000, 'x')) &&
           connection.SleepFor(milliseconds(5))) {
      ++parts;
    }
    returned = true;
  });

  LoopbackClient client(cam->Port());
  ASSERT_TRUE(client.Send(GetRequest("/endless")));
  client.ReadUntil("--myboundary\r\n");
  while (parts < 3) std::this_thread::sleep_for(milliseconds(1));

  cam.reset();
  EXPECT_TRUE(returned);
  EXPECT_TRUE(client.WaitClosed());
}

TEST(FakeCameraTest, DestructionWakesSleepingHandlerWithClientStillConnected) {
  std::atomic<int> sleep_result{-1};
  auto cam = std::make_unique<FakeCamera>();
  std::promise<void> entered;
  cam->Handle("/sleep", [&](evsim::HttpConnection& connection) {
    entered.set_value();
    sleep_result = connection.SleepFor(std::chrono::minutes(10)) ? 1 : 0;
  });
  LoopbackClient client(cam->Port());
  ASSERT_TRUE(client.Send(GetRequest("/sleep")));
  entered.get_future().wait();

  cam.reset();
  EXPECT_EQ(sleep_result, 0);
}

TEST(FakeCameraTest, ManySequentialConnectionsLeaveNoThreadsOrDescriptors) {
  FakeCamera cam;
  cam.Answer("/poll", Text("ok"));
  ASSERT_EQ(Exchange(cam.Port(), GetRequest("/poll")), Text("ok").bytes);  // warm up
  const size_t fds_before = OpenDescriptorCount();
  const size_t threads_before = ThreadCount();

  int answered = 0;
  for (int i = 0; i < 2000; ++i) {
    if (Exchange(cam.Port(), GetRequest("/poll")) == Text("ok").bytes) ++answered;
  }
  EXPECT_EQ(answered, 2000);
  EXPECT_EQ(cam.Count("/poll"), 2001);

  // The last session may still be closing its socket: wait for it, with a generous deadline.
  auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
  while ((OpenDescriptorCount() > fds_before || ThreadCount() > threads_before) &&
         std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(milliseconds(10));
  }
  EXPECT_LE(OpenDescriptorCount(), fds_before);
  EXPECT_LE(ThreadCount(), threads_before);
}

TEST(FakeCameraTest, ConcurrentClientsAreAllAnswered) {
  FakeCamera cam;
  cam.Answer("/c", Text("concurrent"));
  std::atomic<int> answered{0};
  std::vector<std::thread> clients;
  for (int t = 0; t < 8; ++t) {
    clients.emplace_back([&] {
      for (int i = 0; i < 50; ++i) {
        if (Exchange(cam.Port(), GetRequest("/c")) == Text("concurrent").bytes) ++answered;
      }
    });
  }
  for (std::thread& t : clients) t.join();
  EXPECT_EQ(answered, 400);
  EXPECT_EQ(cam.Count("/c"), 400);
}

}  // namespace
}  // namespace evtest
