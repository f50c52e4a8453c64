// Stream readers of the host: a FetcherBase delivers a camera's stream part by part.
//
// MultipartFetch reads a multipart/x-mixed-replace HTTP response (motion JPEG, motion data,
// alert records) with the same pull-style client as VoHttpClient, from the calling thread.
// The connection is opened by the first ReadPartHeader and, after any failed read (time-out,
// lost connection, malformed or refused part, end of the stream), opened again by the next
// ReadPartHeader, so one reader can serve a detector's whole loop. Connection attempts are
// at least a second apart, so a camera that refuses or drops every stream cannot make a
// detector loop spin.
//
// Tolerated: a boundary given with or without a leading "--", LF or CR LF line ends, text
// between a body and the next boundary, parts without Content-Length (their length is then
// found at the next boundary, so ReadPartHeader returns once that boundary has come; the
// line end before the boundary is not part of the body), a missing boundary parameter (the
// first line that begins with "--" is then the boundary). A part longer than kMaxPartLength
// is refused as a failed read and never allocated.
//
// A reader belongs to one thread at a time; deleting it closes the stream.

#ifndef EVWATCH_FRAMEWORK_HOST_FETCHER_H_
#define EVWATCH_FRAMEWORK_HOST_FETCHER_H_

#include <memory>
#include <string>

class FetcherBase {
 public:
  virtual ~FetcherBase();
  // Reads the header of the next part: its header text (zero-terminated, cut to
  // headerSize - 1) into `header` and its body length into *length. 0 = a header was read.
  // Whatever the caller left unread of the previous part is passed over first.
  virtual int ReadPartHeader(int* length, char* header, int headerSize) = 0;
  // Reads exactly `length` bytes of the current part's body. 0 = success; asking for more
  // than the part still holds fails without harming the stream.
  virtual int ReadPartBody(char* buffer, int length) = 0;
  // Passes over what remains of the current part, so that the next ReadPartHeader starts
  // at the next part. 0 = success.
  virtual int SkipContent(char* buffer, int length) = 0;
};

class MultipartStream;

class MultipartFetch : public FetcherBase {
 public:
  // Largest part body accepted.
  static constexpr int kMaxPartLength = 8 * 1024 * 1024;

  // timeout in seconds, as VoHttpClient's. The strings are copied.
  MultipartFetch(const char* host, int port, const char* path, const char* user,
                 const char* password, int timeout);
  MultipartFetch(const MultipartFetch&) = delete;
  MultipartFetch& operator=(const MultipartFetch&) = delete;
  ~MultipartFetch() override;

  int ReadPartHeader(int* length, char* header, int headerSize) override;
  int ReadPartBody(char* buffer, int length) override;
  // The arguments are not used: the rest of the body is dropped as it is read. Returns 0
  // also when no part is current (the next ReadPartHeader reconnects if need be).
  int SkipContent(char* buffer, int length) override;

  // After ReadPartHeader: the current part's header lines, each with its line end as sent,
  // zero-terminated, cut to kOptContentSize - 1 characters. 0 = success; -1 when no part
  // is current.
  // REQUIRES: buf holds at least kOptContentSize bytes (the detectors pass their body
  // buffer, which is never smaller).
  int FetchFrontOptContent(unsigned char* buf);
  // After ReadPartBody: the text between the body and the next boundary line, with its line
  // ends, zero-terminated, cut as above. The line end that closes the body is not part of
  // it; a part without Content-Length has none. It reads on up to that boundary (passing
  // over any unread body), so it returns when the camera has begun its next part; the next
  // ReadPartHeader starts after that boundary. 0 = success; -1 when no part is current or
  // the read fails. Same size rule as FetchFrontOptContent.
  int FetchBackOptContent(unsigned char* buf);

  // Longest text that the two calls above deliver, the zero byte included.
  static constexpr int kOptContentSize = 1024;

 private:
  std::unique_ptr<MultipartStream> stream_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_FETCHER_H_
