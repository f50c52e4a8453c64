// One HTTP GET (or HEAD) whose response the calling thread pulls: the transfer engine under
// VoHttpClient and MultipartFetch. Internal to libevhost; detectors never see it.
//
// libcurl's multi interface is driven from inside Start() and Fill(), on the calling thread;
// nothing runs in the background. Received body bytes collect in a buffer that the owner
// reads through Data()/Buffered() and drops with Consume(). While that buffer holds more
// than the reader asked for (and at least kBufferBound bytes) the transfer is paused, so an
// endless stream costs bounded memory. One object belongs to one thread at a time.
//
// Time-out: `timeout` seconds bound the connection and each wait that gets no new bytes;
// there is no limit on the whole transfer.

#ifndef EVWATCH_HOST_TRANSPORT_HTTPPULL_H_
#define EVWATCH_HOST_TRANSPORT_HTTPPULL_H_

#include <curl/curl.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

// Initialises libcurl once for the process, before the first transfer of any thread; every
// user of libcurl in the host calls it first. False when libcurl cannot be used.
bool CurlReady();

// host as libcurl wants it in a URL: an IPv6 literal in brackets, its zone id escaped as
// "%25"; names and IPv4 addresses unchanged.
std::string UrlHost(const std::string& host);

class HttpPull {
 public:
  struct Target {
    std::string host;  // name, IPv4 or IPv6 literal (brackets optional)
    int port = 80;
    std::string path;  // with its query; a leading "/" is added when missing
    std::string user;  // credentials are used only when user is not empty
    std::string password;
    int timeout = 10;  // seconds; values below 1 count as 1
  };

  enum class Wait {
    kReady,     // the bytes asked for are buffered
    kEnded,     // the body ended normally; fewer bytes than asked are buffered
    kFailed,    // the transfer failed (or never started); buffered bytes stay readable
    kTimedOut,  // no new bytes for `timeout` seconds; the transfer goes on
  };

  // Body bytes held before the transfer pauses, unless a reader waits for more.
  static constexpr size_t kBufferBound = 64 * 1024;

  explicit HttpPull(Target target);
  HttpPull(const HttpPull&) = delete;
  HttpPull& operator=(const HttpPull&) = delete;
  ~HttpPull();  // aborts the transfer

  // Sends the request (once per object) and returns true when the final response's
  // headers are in: the header block of a response that libcurl does not answer with a
  // new request (1xx and answered authentication challenges are skipped).
  bool Start(bool head_only);
  // Status code of the final response; 0 until its headers are in.
  int Status() const;
  // Value of the first response header called `name` (case-insensitive), blanks trimmed.
  bool Header(std::string_view name, std::string* value) const;

  // Received body bytes not consumed yet. Valid until the next non-const call.
  const char* Data() const { return buffer_.data() + head_; }
  size_t Buffered() const { return buffer_.size() - head_; }
  // REQUIRES: n <= Buffered().
  void Consume(size_t n);
  // Waits until at least `want` body bytes are buffered, the body ends, the transfer fails
  // or a wait brings nothing for `timeout` seconds.
  Wait Fill(size_t want);

 private:
  template <typename Done>
  Wait Pump(Done done);
  // Tells the host program's transfer observer how the request went.
  void NoteOutcome() const;
  void Perform();
  void Resume();
  bool Configure();
  size_t OnBody(const char* data, size_t size);
  size_t OnHeader(const char* data, size_t size);
  static size_t BodyThunk(char* data, size_t size, size_t count, void* self);
  static size_t HeaderThunk(char* data, size_t size, size_t count, void* self);
  static int PrereqThunk(void* self, char*, char*, int, int);

  const Target target_;
  CURLM* multi_ = nullptr;  // null until Start
  CURL* easy_ = nullptr;    // null until Start; added to multi_ while the transfer runs
  CURLU* url_ = nullptr;    // the request's URL, kept alive for the transfer
  bool started_ = false;
  bool done_ = false;   // libcurl reported the transfer finished
  CURLcode result_ = CURLE_OK;  // of the finished transfer
  bool paused_ = false;    // the body callback paused the transfer
  bool progress_ = false;  // bytes or a connection arrived since the last check
  size_t want_ = 0;        // bytes the current Fill waits for; the buffer may grow to it
  std::string buffer_;     // body bytes; those before head_ are consumed
  size_t head_ = 0;
  int status_ = 0;  // status of the response whose headers are being read or are in
  std::vector<std::pair<std::string, std::string>> headers_;  // of that response
  size_t header_bytes_ = 0;  // all header bytes received, bounded against endless headers
  bool block_ended_ = false;  // the header block of status_ is complete
  bool headers_in_ = false;   // that block is the final response's
};

#endif  // EVWATCH_HOST_TRANSPORT_HTTPPULL_H_
