#include "sim/net/httpserver.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>

#include "host/text/strutil.h"
#include "sim/net/tcpserver.h"

namespace evsim {

namespace {

// A client has this long to send its request head; a silent one then loses the connection.
constexpr std::chrono::milliseconds kRequestTimeout{10000};
constexpr size_t kMaxHeadBytes = 64 * 1024;
// A request body up to this size is read and kept for the handler; a larger one is refused.
constexpr size_t kMaxBodyBytes = 1024 * 1024;

// Blanks around a header value; the head is already cut at its line ends.
constexpr std::string_view kHeaderBlanks = " \t\r";

// The end of the request head (after its blank line) in buffer, or npos.
size_t HeadEnd(const std::string& buffer) {
  size_t crlf = buffer.find("\r\n\r\n");
  size_t lf = buffer.find("\n\n");
  if (crlf == std::string::npos && lf == std::string::npos) return std::string::npos;
  if (lf == std::string::npos || (crlf != std::string::npos && crlf < lf)) return crlf + 4;
  return lf + 2;
}

enum class ReadResult { kOk, kGone, kBad, kHeadTooLarge, kBodyTooLarge };

// Reads the request head and its Content-Length body.
ReadResult ReadRequest(TcpConnection& tcp, HttpRequest& request) {
  auto deadline = std::chrono::steady_clock::now() + kRequestTimeout;
  auto left = [&deadline] {
    return std::chrono::duration_cast<std::chrono::milliseconds>(
        deadline - std::chrono::steady_clock::now());
  };
  std::string buffer;
  char chunk[4096];
  size_t head_end;
  while ((head_end = HeadEnd(buffer)) == std::string::npos) {
    if (buffer.size() > kMaxHeadBytes) return ReadResult::kHeadTooLarge;
    if (left().count() <= 0) return ReadResult::kGone;
    long n = tcp.Read(chunk, sizeof(chunk), left());
    if (n <= 0) return ReadResult::kGone;
    buffer.append(chunk, static_cast<size_t>(n));
  }
  if (!ParseRequestHead(std::string_view(buffer).substr(0, head_end), request)) return ReadResult::kBad;
  std::string length_text = request.Header("Content-Length");
  if (length_text.empty()) return ReadResult::kOk;
  char* end = nullptr;
  unsigned long long length = std::strtoull(length_text.c_str(), &end, 10);
  if (end == length_text.c_str() || *end != '\0' || length_text[0] == '-') return ReadResult::kBad;
  if (length > kMaxBodyBytes) return ReadResult::kBodyTooLarge;
  request.body = buffer.substr(head_end, static_cast<size_t>(length));
  while (request.body.size() < length) {
    if (left().count() <= 0) return ReadResult::kGone;
    long n = tcp.Read(chunk, std::min<size_t>(sizeof(chunk), length - request.body.size()), left());
    if (n <= 0) return ReadResult::kGone;
    request.body.append(chunk, static_cast<size_t>(n));
  }
  return ReadResult::kOk;
}

class Exchange : public HttpConnection {
 public:
  explicit Exchange(TcpConnection& tcp) : tcp_(tcp) {}

  HttpRequest& MutableRequest() { return request_; }
  const HttpRequest& Request() const override { return request_; }
  bool Write(std::string_view bytes) override { return tcp_.Write(bytes); }
  bool SleepFor(std::chrono::milliseconds duration) override { return tcp_.SleepFor(duration); }
  bool PeerClosed() override { return tcp_.PeerClosed(); }
  bool Stopping() const override { return tcp_.Stopping(); }

 private:
  TcpConnection& tcp_;
  HttpRequest request_;
};

void Serve(const HttpHandler& handler, TcpConnection& tcp) {
  Exchange exchange(tcp);
  switch (ReadRequest(tcp, exchange.MutableRequest())) {
    case ReadResult::kOk:
      handler(exchange);
      return;
    case ReadResult::kBad:
      tcp.Write(MakeResponse(400, "text/plain", "Bad Request\n"));
      return;
    case ReadResult::kHeadTooLarge:
      tcp.Write(MakeResponse(431, "text/plain", "Request Header Fields Too Large\n"));
      return;
    case ReadResult::kBodyTooLarge:
      tcp.Write(MakeResponse(413, "text/plain", "Payload Too Large\n"));
      return;
    case ReadResult::kGone:
      return;
  }
}

}  // namespace

bool ParseRequestHead(std::string_view head, HttpRequest& request) {
  size_t line_end = head.find('\n');
  std::string_view line = TrimBlanks(head.substr(0, line_end), kHeaderBlanks);
  size_t sp1 = line.find(' ');
  size_t sp2 = line.rfind(' ');
  if (sp1 == std::string_view::npos || sp2 == sp1) return false;
  request.method = std::string(line.substr(0, sp1));
  request.target = std::string(TrimBlanks(line.substr(sp1 + 1, sp2 - sp1 - 1), kHeaderBlanks));
  request.version = std::string(line.substr(sp2 + 1));
  if (request.method.empty() || request.target.empty()) return false;
  while (line_end != std::string_view::npos) {
    head.remove_prefix(line_end + 1);
    line_end = head.find('\n');
    line = TrimBlanks(head.substr(0, line_end), kHeaderBlanks);
    if (line.empty()) break;
    size_t colon = line.find(':');
    if (colon == std::string_view::npos) continue;
    request.headers.emplace_back(std::string(TrimBlanks(line.substr(0, colon), kHeaderBlanks)),
                                 std::string(TrimBlanks(line.substr(colon + 1), kHeaderBlanks)));
  }
  return true;
}

std::string HttpRequest::Header(std::string_view name) const {
  for (const auto& [key, value] : headers) {
    if (EqualsNoCase(key, name)) return value;
  }
  return "";
}

std::string HttpRequest::Path() const { return target.substr(0, target.find('?')); }

struct HttpServer::Impl {
  Impl(HttpHandler handler, const std::string& host, int port)
      : tcp([h = std::move(handler)](TcpConnection& c) { Serve(h, c); }, host, port) {}
  TcpServer tcp;
};

HttpServer::HttpServer(HttpHandler handler, std::string host, int port)
    : impl_(std::make_unique<Impl>(std::move(handler), host, port)) {}

HttpServer::~HttpServer() { Stop(); }

int HttpServer::Port() const { return impl_->tcp.Port(); }

void HttpServer::Stop() { impl_->tcp.Stop(); }

std::string MakeResponse(int status, std::string_view content_type, std::string_view body,
                         const std::vector<std::string>& extra_headers, bool chunked) {
  std::string out = "HTTP/1.1 " + std::to_string(status) + " " + ReasonPhrase(status) + "\r\n";
  if (!content_type.empty()) {
    out += "Content-Type: ";
    out += content_type;
    out += "\r\n";
  }
  if (chunked) {
    out += "Transfer-Encoding: chunked\r\n";
  } else {
    out += "Content-Length: " + std::to_string(body.size()) + "\r\n";
  }
  for (const std::string& header : extra_headers) out += header + "\r\n";
  out += "Connection: close\r\n\r\n";
  if (!chunked) {
    out += body;
    return out;
  }
  if (!body.empty()) {
    char size_line[32];
    std::snprintf(size_line, sizeof(size_line), "%zx\r\n", body.size());
    out += size_line;
    out += body;
    out += "\r\n";
  }
  out += "0\r\n\r\n";
  return out;
}

const char* ReasonPhrase(int status) {
  switch (status) {
    case 100: return "Continue";
    case 200: return "OK";
    case 201: return "Created";
    case 202: return "Accepted";
    case 204: return "No Content";
    case 206: return "Partial Content";
    case 301: return "Moved Permanently";
    case 302: return "Found";
    case 303: return "See Other";
    case 304: return "Not Modified";
    case 307: return "Temporary Redirect";
    case 400: return "Bad Request";
    case 401: return "Unauthorized";
    case 403: return "Forbidden";
    case 404: return "Not Found";
    case 405: return "Method Not Allowed";
    case 408: return "Request Timeout";
    case 413: return "Payload Too Large";
    case 414: return "URI Too Long";
    case 431: return "Request Header Fields Too Large";
    case 500: return "Internal Server Error";
    case 501: return "Not Implemented";
    case 502: return "Bad Gateway";
    case 503: return "Service Unavailable";
    case 504: return "Gateway Timeout";
    default: break;
  }
  if (status >= 200 && status < 300) return "OK";
  if (status >= 300 && status < 400) return "Redirect";
  if (status >= 400 && status < 500) return "Client Error";
  if (status >= 500 && status < 600) return "Server Error";
  return "Unknown";
}

}  // namespace evsim
