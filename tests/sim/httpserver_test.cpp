#include "sim/net/httpserver.h"

#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <mutex>
#include <stdexcept>
#include <thread>

#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

using std::chrono::milliseconds;
using evtest::Exchange;
using evtest::GetRequest;
using evtest::LoopbackClient;

TEST(MakeResponseTest, WritesAWholeResponse) {
  EXPECT_EQ(MakeResponse(200, "text/plain", "a=1\r\n"),
            "HTTP/1.1 200 OK\r\nContent-Type: text/plain\r\nContent-Length: 5\r\n"
            "Connection: close\r\n\r\na=1\r\n");
  EXPECT_EQ(MakeResponse(404, "", "", {"X-A: 1", "X-B: 2"}),
            "HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\nX-A: 1\r\nX-B: 2\r\n"
            "Connection: close\r\n\r\n");
}

TEST(MakeResponseTest, WritesAChunkedBody) {
  const std::string body(300, 'z');
  EXPECT_EQ(MakeResponse(200, "text/xml", body, {}, true),
            "HTTP/1.1 200 OK\r\nContent-Type: text/xml\r\nTransfer-Encoding: chunked\r\n"
            "Connection: close\r\n\r\n12c\r\n" + body + "\r\n0\r\n\r\n");
  EXPECT_EQ(MakeResponse(200, "", "", {}, true),
            "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\nConnection: close\r\n\r\n"
            "0\r\n\r\n");
}

TEST(MakeResponseTest, ReasonPhrases) {
  EXPECT_STREQ(ReasonPhrase(200), "OK");
  EXPECT_STREQ(ReasonPhrase(401), "Unauthorized");
  EXPECT_STREQ(ReasonPhrase(404), "Not Found");
  EXPECT_STREQ(ReasonPhrase(500), "Internal Server Error");
  EXPECT_STREQ(ReasonPhrase(503), "Service Unavailable");
  EXPECT_STREQ(ReasonPhrase(299), "OK");
  EXPECT_STREQ(ReasonPhrase(999), "Unknown");
}

TEST(HttpRequestTest, HeaderIsCaseInsensitiveAndPathDropsTheQuery) {
  HttpRequest request;
  request.target = "/a/b.cgi?x=1&y=2";
  request.headers = {{"Content-Type", "text/plain"}, {"X-Dup", "1"}, {"x-dup", "2"}};
  EXPECT_EQ(request.Header("content-type"), "text/plain");
  EXPECT_EQ(request.Header("X-DUP"), "1");
  EXPECT_EQ(request.Header("Missing"), "");
  EXPECT_EQ(request.Path(), "/a/b.cgi");
  request.target = "/plain";
  EXPECT_EQ(request.Path(), "/plain");
}

// Captures the last request a server saw.
class Capture {
 public:
  HttpHandler Handler(std::string answer) {
    return [this, answer](HttpConnection& c) {
      {
        std::lock_guard<std::mutex> lock(mutex_);
        last_ = c.Request();
        ++calls_;
      }
      c.Write(answer);
    };
  }
  HttpRequest Last() {
    std::lock_guard<std::mutex> lock(mutex_);
    return last_;
  }
  int Calls() {
    std::lock_guard<std::mutex> lock(mutex_);
    return calls_;
  }

 private:
  std::mutex mutex_;
  HttpRequest last_;
  int calls_ = 0;
};

TEST(HttpServerTest, ParsesTheRequestHead) {
  Capture capture;
  HttpServer server(capture.Handler("done"));
  ASSERT_GT(server.Port(), 0);

  EXPECT_EQ(Exchange(server.Port(), "GET /cgi/x.cgi?q=1 HTTP/1.1\r\nHost: h\r\n"
                                    "X-Spaced:   padded value  \r\nEmpty:\r\n\r\n"),
            "done");
  HttpRequest seen = capture.Last();
  EXPECT_EQ(seen.method, "GET");
  EXPECT_EQ(seen.target, "/cgi/x.cgi?q=1");
  EXPECT_EQ(seen.version, "HTTP/1.1");
  EXPECT_EQ(seen.headers, (std::vector<std::pair<std::string, std::string>>{
                              {"Host", "h"}, {"X-Spaced", "padded value"}, {"Empty", ""}}));
}

TEST(HttpServerTest, AcceptsBareLineFeeds) {
  Capture capture;
  HttpServer server(capture.Handler("lf"));
  EXPECT_EQ(Exchange(server.Port(), "GET /lf HTTP/1.0\nA: b\n\n"), "lf");
  EXPECT_EQ(capture.Last().target, "/lf");
  EXPECT_EQ(capture.Last().Header("a"), "b");
}

TEST(HttpServerTest, ReadsAndDiscardsARequestBody) {
  Capture capture;
  HttpServer server(capture.Handler("posted"));
  LoopbackClient client(server.Port());
  ASSERT_TRUE(client.Send("POST /form HTTP/1.1\r\nContent-Length: 10\r\n\r\n01234"));
  std::this_thread::sleep_for(milliseconds(20));
  EXPECT_EQ(capture.Calls(), 0);  // the handler waits for the whole body
  ASSERT_TRUE(client.Send("56789"));
  EXPECT_EQ(client.ReadAll(), "posted");
  EXPECT_EQ(capture.Last().method, "POST");
}

TEST(HttpServerTest, MalformedRequestsGetAnErrorWithoutTheHandler) {
  Capture capture;
  HttpServer server(capture.Handler("never"));
  EXPECT_EQ(Exchange(server.Port(), "NONSENSE\r\n\r\n").rfind("HTTP/1.1 400 Bad Request\r\n", 0),
            0u);
  EXPECT_EQ(Exchange(server.Port(), "GET /x HTTP/1.1\r\nContent-Length: -5\r\n\r\n")
                .rfind("HTTP/1.1 400", 0),
            0u);
  EXPECT_EQ(Exchange(server.Port(), "GET /x HTTP/1.1\r\nContent-Length: 99999999999\r\n\r\n")
                .rfind("HTTP/1.1 413", 0),
            0u);
  std::string huge = "GET /x HTTP/1.1\r\nX: " + std::string(70 * 1024, 'a') + "\r\n\r\n";
  EXPECT_EQ(Exchange(server.Port(), huge).rfind("HTTP/1.1 431", 0), 0u);
  EXPECT_EQ(capture.Calls(), 0);
}

TEST(HttpServerTest, ServesIpv6Loopback) {
  Capture capture;
  HttpServer server(capture.Handler("six"), "::1");
  if (server.Port() <= 0) GTEST_SKIP() << "no IPv6 loopback here";
  LoopbackClient client(server.Port(), true);
  ASSERT_TRUE(client.Connected());
  ASSERT_TRUE(client.Send(GetRequest("/6")));
  EXPECT_EQ(client.ReadAll(), "six");
}

TEST(HttpServerTest, FailsToListenOnABusyPort) {
  Capture capture;
  HttpServer first(capture.Handler(""));
  ASSERT_GT(first.Port(), 0);
  HttpServer second(capture.Handler(""), "127.0.0.1", first.Port());
  EXPECT_LE(second.Port(), 0);
}

TEST(HttpServerTest, HandlerSeesThePeerClose) {
  std::promise<bool> saw_close;
  HttpServer server([&saw_close](HttpConnection& c) {
    c.Write("HTTP/1.1 200 OK\r\n\r\n");
    bool closed = false;
    for (int i = 0; i < 1000 && !closed; ++i) {
      closed = c.PeerClosed();
      if (!closed && !c.SleepFor(milliseconds(10))) break;
    }
    saw_close.set_value(closed);
  });
  {
    LoopbackClient client(server.Port());
    ASSERT_TRUE(client.Send(GetRequest("/")));
    client.ReadUntil("\r\n\r\n");
  }
  EXPECT_TRUE(saw_close.get_future().get());
}

TEST(HttpServerTest, PeerStillOpenIsNotClosed) {
  std::promise<bool> result;
  std::promise<void> checked;
  HttpServer server([&](HttpConnection& c) {
    result.set_value(c.PeerClosed());
    checked.get_future().wait_for(std::chrono::seconds(10));
  });
  LoopbackClient client(server.Port());
  ASSERT_TRUE(client.Send(GetRequest("/")));
  EXPECT_FALSE(result.get_future().get());
  checked.set_value();
}

TEST(HttpServerTest, WriteToAGoneClientFailsWithoutSignal) {
  std::promise<bool> write_failed;
  std::promise<void> client_gone;
  HttpServer server([&](HttpConnection& c) {
    client_gone.get_future().wait_for(std::chrono::seconds(10));
    bool failed = false;
    const std::string block(64 * 1024, 'x');
    for (int i = 0; i < 1000 && !failed; ++i) failed = !c.Write(block);
    write_failed.set_value(failed);
  });
  {
    LoopbackClient client(server.Port());
    ASSERT_TRUE(client.Send(GetRequest("/")));
    std::this_thread::sleep_for(milliseconds(20));
  }
  client_gone.set_value();
  EXPECT_TRUE(write_failed.get_future().get());
}

TEST(HttpServerTest, StopWakesSleepersAndSilentClientsAndIsIdempotent) {
  std::atomic<int> finished{0};
  std::atomic<bool> sleep_result{true};
  std::atomic<bool> write_after_stop{true};
  std::promise<void> sleeping;
  HttpServer server([&](HttpConnection& c) {
    sleeping.set_value();
    sleep_result = c.SleepFor(std::chrono::minutes(10));
    write_after_stop = c.Write("late");
    EXPECT_TRUE(c.Stopping());
    ++finished;
  });
  LoopbackClient sleeper(server.Port());
  ASSERT_TRUE(sleeper.Send(GetRequest("/")));
  LoopbackClient silent(server.Port());  // sends nothing: its session waits for a request
  ASSERT_TRUE(silent.Connected());
  sleeping.get_future().wait();

  server.Stop();
  server.Stop();
  EXPECT_EQ(finished, 1);
  EXPECT_FALSE(sleep_result);
  EXPECT_FALSE(write_after_stop);
  EXPECT_TRUE(silent.WaitClosed());
  EXPECT_TRUE(sleeper.WaitClosed());
}

TEST(HttpServerTest, ThrowingHandlerLosesOnlyItsConnection) {
  std::atomic<int> calls{0};
  HttpServer server([&calls](HttpConnection& c) {
    if (++calls == 1) throw std::runtime_error("handler failure");
    c.Write("fine");
  });
  EXPECT_EQ(Exchange(server.Port(), GetRequest("/")), "");
  EXPECT_EQ(Exchange(server.Port(), GetRequest("/")), "fine");
}

TEST(HttpServerTest, ManyConcurrentClients) {
  HttpServer server([](HttpConnection& c) {
    c.Write(MakeResponse(200, "text/plain", c.Request().target));
  });
  std::atomic<int> right{0};
  std::vector<std::thread> clients;
  for (int t = 0; t < 16; ++t) {
    clients.emplace_back([&, t] {
      for (int i = 0; i < 100; ++i) {
        std::string target = "/" + std::to_string(t) + "/" + std::to_string(i);
        if (Exchange(server.Port(), GetRequest(target)) == MakeResponse(200, "text/plain", target)) {
          ++right;
        }
      }
    });
  }
  for (std::thread& t : clients) t.join();
  EXPECT_EQ(right, 1600);
}

}  // namespace
}  // namespace evsim
