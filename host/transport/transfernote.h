// What our host's transfers to each camera address come to, for a host program that shows
// camera health (evwatch). The HTTP client, the multipart reader and the TCP socket note the
// outcome of every connection and request here: ok when the camera answered (HTTP 2xx, a
// connection made), else the cause in words. Nothing is noted unless a program has set an
// observer, and no cause ever holds a credential.
//
// Threads: NoteTransfer runs on the detectors' threads, many at once; the observer is called
// there and must be thread-safe. SetTransferObserver from any thread.

#ifndef EVWATCH_HOST_TRANSPORT_TRANSFERNOTE_H_
#define EVWATCH_HOST_TRANSPORT_TRANSFERNOTE_H_

#include <functional>
#include <string>

struct TransferOutcome {
  std::string host;
  int port = 0;
  bool ok = false;
  std::string cause;  // when not ok: "connection refused", "HTTP 401 (credentials refused)", ...
};

using TransferObserver = std::function<void(const TransferOutcome&)>;

// Replaces the observer; an empty one stops the notes.
void SetTransferObserver(TransferObserver observer);

// Passes the outcome to the observer, if there is one.
void NoteTransfer(const std::string& host, int port, bool ok, const std::string& cause = "");

// The cause of a final HTTP status other than 2xx, in words.
std::string HttpStatusCause(int status);

#endif  // EVWATCH_HOST_TRANSPORT_TRANSFERNOTE_H_
