// The CGI request helpers of the polled detectors.
//
// Every helper opens a new VoHttpClient per request and deletes it before it returns; no
// connection outlives a call. CgiRequest holds the steps that all of them share (GET, a 2xx
// answer, the first token of the Content-Type); the helpers and the camera modules differ
// only in the media type they accept and in how they read the body.
//
// Threads: the functions are called from detector threads, several at once; each call uses
// only its own client and stack buffers.

#ifndef EVWATCH_FRAMEWORK_HTTPREQ_H_
#define EVWATCH_FRAMEWORK_HTTPREQ_H_

#include <memory>
#include <string>

class Camera;
class VoHttpClient;

// 1 when the camera's text answer to path holds, within its first 10 lines and before an
// empty line, a line whose key begins with `key` and whose value begins with `value` (both
// compared without regard to case); 0 otherwise, including every failure. Time-out 10 s.
int SendHttpReqAndCheckResp(Camera* camera, std::string path, std::string key,
                            std::string value);

// 0 when the camera's text answer to path was read to an empty line or to its tenth line;
// `value` then holds the first word (delimiters blank and apostrophe) after the last line
// whose key begins with `key`, or is left untouched when there was none. -1 on any failure,
// including a body that ends before that point. Time-out 10 s.
int SendHttpReqAndGetResp(Camera* camera, std::string path, std::string key,
                          std::string& value);

// Whether a request looks at the answer's Content-Type.
enum class ContentTypeRule {
  kRequired,  // the header and its first token must exist
  kIgnored,   // the answer is read whatever its type, or none
};

// One CGI request, opened as every helper opens it: a new client on the camera's host, port
// and credentials, a GET, a 2xx answer, and (unless `rule` is kIgnored) a Content-Type whose
// first token (delimiters " :;=", taken from a copy cut to workSize - 1 characters) exists.
class CgiRequest {
 public:
  CgiRequest(Camera* camera, const std::string& path, int timeout, int workSize = 1024,
             ContentTypeRule rule = ContentTypeRule::kRequired);
  ~CgiRequest();
  CgiRequest(const CgiRequest&) = delete;
  CgiRequest& operator=(const CgiRequest&) = delete;

  // Whether every opening step succeeded (a null camera fails).
  bool Ok() const { return ok_; }
  // Whether the Content-Type's first token begins with `type`, compared without regard to
  // case over type's length. False when the request failed or the type was not read.
  bool ContentTypeIs(const char* type) const;
  // The open client, for reading the body. REQUIRES: Ok().
  VoHttpClient& Client() { return *client_; }

 private:
  std::unique_ptr<VoHttpClient> client_;
  std::string token_;  // first token of the Content-Type
  bool ok_ = false;
};

// How a key/value scan treats empty lines and matches: the one difference between the
// shared helper and the Axis-family module copy of it.
enum class LineScan {
  kShared,  // an empty line ends the scan; a match does not (reading goes on)
  kModule,  // empty lines count towards the 10; the first match ends the scan
};

// Reads up to 10 body lines of 1024 bytes and looks for a line whose first token
// (delimiters " :=") begins with `key` and whose next token (delimiter " ") begins with
// `value`, both compared without regard to case. The scan stops at a failed read, at a line
// without a token, and at a key match without a value token. Returns whether a line matched.
bool MatchKeyValueLines(VoHttpClient& client, const std::string& key, const std::string& value,
                        LineScan style);

#endif  // EVWATCH_FRAMEWORK_HTTPREQ_H_
