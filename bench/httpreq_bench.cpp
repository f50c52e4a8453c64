// Cost of one CGI question through SendHttpReqAndCheckResp against a loopback camera, beside
// a plain libcurl loop that asks the same question with a new easy handle each time. Both run
// in the same process against the same server; the program prints both and their ratio.

#include <benchmark/benchmark.h>
#include <curl/curl.h>

#include <cstdio>
#include <map>
#include <string>

#include "framework/host/camera.h"
#include "framework/httpreq.h"
#include "sim/net/httpserver.h"

namespace {

const char kPath[] = "/axis-cgi/io/input.cgi?checkactive=1";

evsim::HttpServer& Server() {
  static evsim::HttpServer server([](evsim::HttpConnection& c) {
    c.Write(evsim::MakeResponse(200, "text/plain", "input1=active\r\n"));
  });
  return server;
}

void BM_SendHttpReqAndCheckResp(benchmark::State& state) {
  CameraRecord record;
  record.host = "127.0.0.1";
  record.port = Server().Port();
  Camera camera(record);
  for (auto _ : state) {
    if (SendHttpReqAndCheckResp(&camera, kPath, "input1", "active") != 1) {
      state.SkipWithError("camera answer not matched");
      break;
    }
  }
}

size_t Collect(char* data, size_t size, size_t count, void* out) {
  static_cast<std::string*>(out)->append(data, size * count);
  return size * count;
}

void BM_PlainLibcurl(benchmark::State& state) {
  std::string url = "http://127.0.0.1:" + std::to_string(Server().Port()) + kPath;
  for (auto _ : state) {
    std::string body;
    CURL* curl = curl_easy_init();
    curl_easy_setopt(curl, CURLOPT_URL, url.c_str());
    curl_easy_setopt(curl, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(curl, CURLOPT_CONNECTTIMEOUT, 10L);
    curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, &Collect);
    curl_easy_setopt(curl, CURLOPT_WRITEDATA, &body);
    CURLcode rc = curl_easy_perform(curl);
    long status = 0;
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &status);
    curl_easy_cleanup(curl);
    if (rc != CURLE_OK || status != 200 || body.find("input1=active") == std::string::npos) {
      state.SkipWithError("plain request failed");
      break;
    }
  }
}

BENCHMARK(BM_SendHttpReqAndCheckResp)->MinTime(2.0)->UseRealTime();
BENCHMARK(BM_PlainLibcurl)->MinTime(2.0)->UseRealTime();

// Keeps each run's time per iteration so that main can print the ratio.
class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& run : runs) {
      if (run.iterations > 0) {
        real_[run.benchmark_name()] = run.GetAdjustedRealTime();
        cpu_[run.benchmark_name()] = run.GetAdjustedCPUTime();
      }
    }
    ConsoleReporter::ReportRuns(runs);
  }
  std::map<std::string, double> real_, cpu_;
};

}  // namespace

int main(int argc, char** argv) {
  curl_global_init(CURL_GLOBAL_ALL);
  benchmark::Initialize(&argc, argv);
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  const std::string ours = "BM_SendHttpReqAndCheckResp/min_time:2.000/real_time";
  const std::string plain = "BM_PlainLibcurl/min_time:2.000/real_time";
  if (reporter.real_.count(ours) && reporter.real_.count(plain)) {
    printf("\nOne CGI request on loopback (time per request, same run):\n");
    printf("  SendHttpReqAndCheckResp  %8.1f us wall  %8.1f us cpu\n", reporter.real_[ours] / 1e3,
           reporter.cpu_[ours] / 1e3);
    printf("  plain libcurl loop       %8.1f us wall  %8.1f us cpu\n", reporter.real_[plain] / 1e3,
           reporter.cpu_[plain] / 1e3);
    printf("  ratio (ours / plain)     %8.2f wall     %8.2f cpu   (target: at most 1.20)\n",
           reporter.real_[ours] / reporter.real_[plain], reporter.cpu_[ours] / reporter.cpu_[plain]);
  }
  benchmark::Shutdown();
  curl_global_cleanup();
  return 0;
}
