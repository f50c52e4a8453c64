#include "framework/host/fetcher.h"

#include <algorithm>
#include <chrono>
#include <cstring>
#include <string_view>
#include <thread>

#include "host/text/strutil.h"
#include "host/transport/httppull.h"
#include "host/transport/transfernote.h"

namespace {

using Clock = std::chrono::steady_clock;

// Longest piece of a line taken at once; a longer line is taken in several pieces.
constexpr size_t kPieceLimit = 8 * 1024;
// Longest part header accepted.
constexpr size_t kMaxHeaderText = 64 * 1024;
// Longest boundary parameter accepted (RFC 2046 allows 70 characters).
constexpr size_t kMaxBoundary = 200;
// Bytes passed over while looking for a boundary before the stream is given up.
constexpr size_t kMaxScan = MultipartFetch::kMaxPartLength + kMaxHeaderText;
// Least time between two connection attempts, so a camera that refuses or drops every
// stream does not make a detector loop spin.
constexpr std::chrono::seconds kReconnectPause{1};

// Copies text cut to size - 1 bytes and a terminating zero.
void CopyCut(std::string_view text, char* out, size_t size) {
  size_t n = std::min(text.size(), size - 1);
  std::memcpy(out, text.data(), n);
  out[n] = '\0';
}

// The boundary parameter of a multipart Content-Type ("" when absent); false when the
// type is not multipart.
bool ParseMultipartType(std::string_view type, std::string* boundary) {
  size_t semicolon = type.find(';');
  if (!StartsNoCase(TrimBlanks(type.substr(0, semicolon)), "multipart/")) return false;
  boundary->clear();
  while (semicolon != std::string_view::npos) {
    type.remove_prefix(semicolon + 1);
    size_t equals = type.find('=');
    semicolon = type.find(';');
    if (equals == std::string_view::npos || (semicolon != std::string_view::npos &&
                                             semicolon < equals)) {
      continue;
    }
    if (!EqualsNoCase(TrimBlanks(type.substr(0, equals)), "boundary")) continue;
    std::string_view value = TrimBlanks(type.substr(equals + 1));
    if (!value.empty() && value.front() == '"') {
      size_t close = value.find('"', 1);
      value = value.substr(1, close == std::string_view::npos ? std::string_view::npos
                                                              : close - 1);
    } else {
      value = TrimBlanks(value.substr(0, value.find(';')));
    }
    *boundary = std::string(value);
    return true;
  }
  return true;
}

// Content-Length of a part's header lines: 1 found (in *length, capped above
// kMaxPartLength), 0 absent, -1 malformed.
int ParseContentLength(std::string_view header, long* length) {
  while (!header.empty()) {
    size_t end = header.find('\n');
    std::string_view line = header.substr(0, end);
    header.remove_prefix(end == std::string_view::npos ? header.size() : end + 1);
    size_t colon = line.find(':');
    if (colon == std::string_view::npos || !EqualsNoCase(TrimBlanks(line.substr(0, colon)),
                                                         "Content-Length")) {
      continue;
    }
    std::string_view digits = TrimBlanks(line.substr(colon + 1));
    if (digits.empty()) return -1;
    long value = 0;
    for (char c : digits) {
      if (c < '0' || c > '9') return -1;
      value = std::min<long>(value * 10 + (c - '0'), MultipartFetch::kMaxPartLength + 1L);
    }
    *length = value;
    return 1;
  }
  return 0;
}

void DropLineEnd(std::string* text) {
  if (!text->empty() && text->back() == '\n') text->pop_back();
  if (!text->empty() && text->back() == '\r') text->pop_back();
}

}  // namespace

// The multipart stream behind MultipartFetch: one HTTP response at a time, opened again
// after any failure. Used by the one thread that owns the fetcher.
class MultipartStream {
 public:
  explicit MultipartStream(HttpPull::Target target) : target_(std::move(target)) {}
  MultipartStream(const MultipartStream&) = delete;
  MultipartStream& operator=(const MultipartStream&) = delete;

  int ReadPartHeader(int* length, char* header, int header_size);
  int ReadPartBody(char* buffer, int length);
  int SkipContent();
  int FetchFront(unsigned char* buf);
  int FetchBack(unsigned char* buf);

 private:
  enum class LineKind { kText, kBoundary, kClose };

  bool Connect();
  int Fail();
  void Close();
  bool NextPiece(std::string* piece);
  bool NextClassified(std::string* piece, LineKind* kind);
  LineKind Classify(std::string_view piece);
  bool SkipToBoundary(std::string* text);
  bool ReadHeaderLines();
  bool ReadBodyToBoundary();
  bool DropBody();

  const HttpPull::Target target_;
  std::unique_ptr<HttpPull> pull_;  // null while no stream is open
  bool attempted_ = false;          // last_attempt_ holds a time
  Clock::time_point last_attempt_;  // start of the last connection attempt
  std::string boundary_;   // delimiter line "--" + parameter; empty: the first "--" line
  std::string alternate_;  // the parameter as a delimiter when it already starts with "--"
  bool line_start_ = true;  // the next byte of the stream begins a line
  bool streaming_ = false;  // a stream is open (noted as answering)
  bool at_header_ = false;  // the boundary line before the next part's header is consumed
  bool in_part_ = false;    // a part header was read and that part is current
  bool stored_ = false;     // the current body was read to its boundary into body_
  long remaining_ = 0;      // body bytes of the current part still in the stream
  std::string body_;        // the current body when stored_
  size_t body_read_ = 0;    // bytes of body_ already handed out
  std::string front_;       // header lines of the current part, as sent
  bool back_read_ = false;  // back_ holds the current part's trailing text
  std::string back_;
};

bool MultipartStream::Connect() {
  Close();
  if (attempted_) {
    auto pause = std::min<Clock::duration>(kReconnectPause,
                                           std::chrono::seconds(std::max(1, target_.timeout)));
    std::this_thread::sleep_until(last_attempt_ + pause);
  }
  attempted_ = true;
  last_attempt_ = Clock::now();
  pull_ = std::make_unique<HttpPull>(target_);
  std::string type;
  std::string parameter;
  if (!pull_->Start(false) || pull_->Status() < 200 || pull_->Status() > 299) return false;
  if (!pull_->Header("Content-Type", &type) || !ParseMultipartType(type, &parameter) ||
      parameter.size() > kMaxBoundary) {
    NoteTransfer(target_.host, target_.port, false, "the answer is not a multipart stream");
    return false;
  }
  streaming_ = true;
  if (!parameter.empty()) {
    boundary_ = "--" + parameter;
    if (parameter.compare(0, 2, "--") == 0) alternate_ = parameter;
  }
  return true;
}

int MultipartStream::Fail() {
  if (streaming_) NoteTransfer(target_.host, target_.port, false, "the stream ended or broke off");
  Close();
  return -1;
}

void MultipartStream::Close() {
  pull_.reset();
  streaming_ = false;
  boundary_.clear();
  alternate_.clear();
  line_start_ = true;
  at_header_ = false;
  in_part_ = false;
  stored_ = false;
  remaining_ = 0;
  std::string().swap(body_);  // a large part's memory goes with it
  body_read_ = 0;
  front_.clear();
  back_read_ = false;
  back_.clear();
}

// The next line of the stream with its LF, or a piece of kPieceLimit bytes of a longer
// line, or the stream's last bytes. False at the end of the stream or on failure.
bool MultipartStream::NextPiece(std::string* piece) {
  size_t scanned = 0;
  for (;;) {
    const size_t have = pull_->Buffered();
    const size_t scan = std::min(have, kPieceLimit);
    const char* data = pull_->Data();
    const void* lf = std::memchr(data + scanned, '\n', scan - scanned);
    size_t take = 0;
    if (lf != nullptr) {
      take = static_cast<size_t>(static_cast<const char*>(lf) - data) + 1;
    } else if (have >= kPieceLimit) {
      take = kPieceLimit;
    }
    if (take > 0) {
      piece->assign(data, take);
      pull_->Consume(take);
      line_start_ = piece->back() == '\n';
      return true;
    }
    scanned = scan;
    HttpPull::Wait wait = pull_->Fill(have + 1);
    if (wait == HttpPull::Wait::kReady) continue;
    if (wait != HttpPull::Wait::kEnded || have == 0) return false;
    piece->assign(pull_->Data(), have);
    pull_->Consume(have);
    line_start_ = false;
    return true;
  }
}

// The next piece, and what it is: a delimiter only when it begins a line.
bool MultipartStream::NextClassified(std::string* piece, LineKind* kind) {
  const bool at_line_start = line_start_;
  if (!NextPiece(piece)) return false;
  *kind = at_line_start ? Classify(*piece) : LineKind::kText;
  return true;
}

MultipartStream::LineKind MultipartStream::Classify(std::string_view piece) {
  std::string_view line = TrimBlanks(piece);
  if (boundary_.empty()) {
    // No boundary parameter: the first delimiter-like line names it.
    if (line.size() <= 2 || line.compare(0, 2, "--") != 0) return LineKind::kText;
    boundary_ = std::string(line);
    return LineKind::kBoundary;
  }
  for (const std::string* delimiter : {&boundary_, &alternate_}) {
    if (delimiter->empty() || line.compare(0, delimiter->size(), *delimiter) != 0) continue;
    std::string_view rest = line.substr(delimiter->size());
    if (rest.empty()) return LineKind::kBoundary;
    if (rest == "--") return LineKind::kClose;
  }
  return LineKind::kText;
}

// Reads up to and including the next boundary line; what came before it is appended to
// text (when given) up to kOptContentSize + 2 bytes.
bool MultipartStream::SkipToBoundary(std::string* text) {
  size_t passed = 0;
  std::string piece;
  LineKind kind;
  for (;;) {
    if (!NextClassified(&piece, &kind)) return false;
    if (kind == LineKind::kBoundary) return true;
    if (kind == LineKind::kClose) return false;  // the camera ended the stream
    passed += piece.size();
    if (passed > kMaxScan) return false;
    if (text != nullptr) {
      size_t room = MultipartFetch::kOptContentSize + 2 - std::min<size_t>(
          text->size(), MultipartFetch::kOptContentSize + 2);
      text->append(piece, 0, room);
    }
  }
}

// Reads the part header lines up to the blank line into front_.
bool MultipartStream::ReadHeaderLines() {
  front_.clear();
  std::string piece;
  for (;;) {
    if (!NextPiece(&piece) || piece.back() != '\n') return false;
    if (TrimBlanks(piece).empty()) return true;
    front_ += piece;
    if (front_.size() > kMaxHeaderText) return false;
  }
}

// Reads a body without Content-Length: everything up to the line end before the next
// boundary line.
bool MultipartStream::ReadBodyToBoundary() {
  body_.clear();
  body_read_ = 0;
  std::string piece;
  LineKind kind;
  for (;;) {
    if (!NextClassified(&piece, &kind)) return false;
    if (kind != LineKind::kText) {
      DropLineEnd(&body_);
      // After a closing delimiter the stream ends; the next header read finds that out.
      at_header_ = kind == LineKind::kBoundary;
      return true;
    }
    body_ += piece;
    if (body_.size() > static_cast<size_t>(MultipartFetch::kMaxPartLength)) return false;
  }
}

// Passes over the body bytes of the current part that are still in the stream.
bool MultipartStream::DropBody() {
  while (remaining_ > 0) {
    size_t take = std::min(pull_->Buffered(), static_cast<size_t>(remaining_));
    if (take > 0) {
      pull_->Consume(take);
      remaining_ -= static_cast<long>(take);
      continue;
    }
    size_t want = std::min(static_cast<size_t>(remaining_), HttpPull::kBufferBound);
    if (pull_->Fill(want) != HttpPull::Wait::kReady &&
        pull_->Buffered() < static_cast<size_t>(remaining_)) {
      return false;
    }
  }
  return true;
}

int MultipartStream::ReadPartHeader(int* length, char* header, int header_size) {
  if (length == nullptr || header == nullptr || header_size < 1) return -1;
  if (pull_ == nullptr && !Connect()) return Fail();
  if (in_part_ && !DropBody()) return Fail();
  in_part_ = false;
  if (!at_header_ && !SkipToBoundary(nullptr)) return Fail();
  at_header_ = false;
  if (!ReadHeaderLines()) return Fail();
  long declared = 0;
  int found = ParseContentLength(front_, &declared);
  // A refused length is never allocated; the stream cannot be trusted past it.
  if (found < 0 || declared > MultipartFetch::kMaxPartLength) return Fail();
  stored_ = found == 0;
  if (stored_) {
    if (!ReadBodyToBoundary()) return Fail();
    remaining_ = 0;
  } else {
    remaining_ = declared;
  }
  in_part_ = true;
  back_read_ = false;
  back_.clear();
  CopyCut(front_, header, static_cast<size_t>(header_size));
  *length = stored_ ? static_cast<int>(body_.size()) : static_cast<int>(declared);
  return 0;
}

int MultipartStream::ReadPartBody(char* buffer, int length) {
  if (!in_part_ || length < 0 || (length > 0 && buffer == nullptr)) return -1;
  if (stored_) {
    if (static_cast<size_t>(length) > body_.size() - body_read_) return -1;
    std::memcpy(buffer, body_.data() + body_read_, static_cast<size_t>(length));
    body_read_ += static_cast<size_t>(length);
    return 0;
  }
  if (length > remaining_) return -1;
  size_t done = 0;
  const size_t need = static_cast<size_t>(length);
  while (done < need) {
    size_t take = std::min(pull_->Buffered(), need - done);
    if (take > 0) {
      std::memcpy(buffer + done, pull_->Data(), take);
      pull_->Consume(take);
      done += take;
      remaining_ -= static_cast<long>(take);
      continue;
    }
    size_t want = std::min(need - done, HttpPull::kBufferBound);
    if (pull_->Fill(want) != HttpPull::Wait::kReady && pull_->Buffered() < need - done) {
      return Fail();
    }
  }
  return 0;
}

int MultipartStream::SkipContent() {
  if (pull_ == nullptr || !in_part_) return 0;  // nothing open: the next header reconnects
  if (stored_) {
    body_read_ = body_.size();
    return 0;
  }
  return DropBody() ? 0 : Fail();
}

int MultipartStream::FetchFront(unsigned char* buf) {
  if (buf == nullptr || !in_part_) return -1;
  CopyCut(front_, reinterpret_cast<char*>(buf), MultipartFetch::kOptContentSize);
  return 0;
}

int MultipartStream::FetchBack(unsigned char* buf) {
  if (buf == nullptr || !in_part_) return -1;
  if (!back_read_ && !stored_) {
    if (!DropBody()) return Fail();
    std::string text;
    if (!SkipToBoundary(&text)) return Fail();
    at_header_ = true;
    // The line end right after the body closes the body; it is not trailing text.
    if (text.compare(0, 2, "\r\n") == 0) {
      text.erase(0, 2);
    } else if (text.compare(0, 1, "\n") == 0) {
      text.erase(0, 1);
    }
    back_ = std::move(text);
  }
  back_read_ = true;
  CopyCut(back_, reinterpret_cast<char*>(buf), MultipartFetch::kOptContentSize);
  return 0;
}

FetcherBase::~FetcherBase() = default;

MultipartFetch::MultipartFetch(const char* host, int port, const char* path, const char* user,
                               const char* password, int timeout)
    : stream_(std::make_unique<MultipartStream>(HttpPull::Target{
          host ? host : "", port, path ? path : "", user ? user : "",
          password ? password : "", timeout})) {}

MultipartFetch::~MultipartFetch() = default;

int MultipartFetch::ReadPartHeader(int* length, char* header, int headerSize) {
  return stream_->ReadPartHeader(length, header, headerSize);
}

int MultipartFetch::ReadPartBody(char* buffer, int length) {
  return stream_->ReadPartBody(buffer, length);
}

int MultipartFetch::SkipContent(char*, int) { return stream_->SkipContent(); }

int MultipartFetch::FetchFrontOptContent(unsigned char* buf) { return stream_->FetchFront(buf); }

int MultipartFetch::FetchBackOptContent(unsigned char* buf) { return stream_->FetchBack(buf); }
