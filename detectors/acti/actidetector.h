// ACTi cameras: motion over the camera's binary control connection (ACTiMD) and alarm inputs
// from its digital-input CGI (ACTiEID), with the pieces that open that connection: the
// socket with TCP keep-alive (ACTiSocket), the query of the control port (GetControlPort)
// and the binary login (ControlConnectAuth).
//
// Every integer on the control connection is a little-endian 32-bit value. Records, in both
// directions: a 4-byte tag ("ACTi" in what we send), the record type, the signed payload
// length, then the payload. The login is a bare 128-byte packet answered by a reply whose
// first byte is 0 when the camera accepts it.
//
// Threads: the host thread constructs, binds, starts, stops and deletes a detector; its
// worker thread runs EventDetecor and alone touches the socket and the live-request time.
// The free functions may be called from any thread, each call using only its own objects.
// The Camera is the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_ACTI_ACTIDETECTOR_H_
#define EVWATCH_DETECTORS_ACTI_ACTIDETECTOR_H_

#include <sys/time.h>

#include <functional>
#include <string>

#include "framework/detector.h"
#include "framework/host/vosocket.h"

class Camera;

// The control connection's socket: a VoSocket that can turn TCP keep-alive on, so a camera
// that vanishes without closing is noticed even while no records flow.
class ACTiSocket : public VoSocket {
 public:
  // The arguments mean what they mean to VoSocket (the detector passes 1 and false: reads
  // wait at most a second and return what one wait delivers).
  ACTiSocket(std::string host, int port, int timeout, bool whole);
  ~ACTiSocket() override;

  // Connects, then sets SO_KEEPALIVE, TCP_KEEPIDLE (idle seconds), TCP_KEEPINTVL (seconds
  // between probes) and TCP_KEEPCNT (probes), in that order. Returns 0 on success, the
  // non-zero result of BuildConnect when the connection failed, or -1 at the first option
  // that cannot be set (the later ones stay unset and the connection stays open).
  int BuildConnectWithKeepAlive(int idle, int interval, int count);
};

// The value with its four bytes in reverse order, whatever the host's byte order.
int ChangeEndianInt(unsigned int value);

// Asks the camera's system CGI for its control port. Returns 0 and sets port to the decimal
// value found (0 when the value is not a number; the connection attempt then fails), -1 when
// camera is null or the request failed.
int GetControlPort(Camera* camera, int& port);

// Connects socket (with keep-alive after 5 s idle, probes every 5 s, 3 of them) and logs in
// with the camera's user name and password. Returns 0 when the camera accepted the login, -1
// otherwise. The socket stays the caller's, to delete on failure too.
// REQUIRES: socket is not connected yet.
int ControlConnectAuth(Camera* camera, ACTiSocket* socket);

class ACTiMD : public DetectorBase {
 public:
  // Source of the current time for the live-request timing.
  using TimeSource = std::function<timeval()>;

  explicit ACTiMD(Camera* camera);
  ~ACTiMD() override;

  // One connection attempt as the loop makes it: fetch the control port, connect and log in.
  // 0 when logged in (the live-request time then starts now); -1 with no connection left
  // otherwise. REQUIRES: no connection is open.
  int OpenControlConnection();
  // One read of the connection: (true, 100) when a motion record came, (false, 0) for another
  // record or when nothing came within the socket's wait. Returns 0 with a reading, -1 when
  // there is no connection or it was lost (it is then closed and dropped).
  int DoMD(bool& detected, unsigned int& level);
  // 1, and the last live-request time set to now, when 20 seconds or more have passed since
  // that time; otherwise 0.
  int CheckLiveReqTimeout();
  // Sets the last live-request time to now.
  void ResetLiveReqTimeout();
  // Sends the live request that keeps the camera sending records, when it is due. 0 when
  // nothing was due or it went out; -1 when there is no connection or the write failed (the
  // connection is then dropped).
  int SendLiveReq();
  // Replaces gettimeofday as the clock of the live-request timing (tests run it on a fake
  // clock). REQUIRES: not started.
  void SetTimeSource(TimeSource now);

  int EventDetecor() override;

 private:
  void DropConnection();

  Camera* camera_;             // not owned
  int control_port_;           // from GetControlPort, fetched before every connection attempt
  ACTiSocket* socket_;         // owned; null while there is no logged-in connection
  timeval last_live_request_;  // time of the last live request, or of the login
  TimeSource now_;             // never empty
};

class ACTiEID : public DetectorBase {
 public:
  // Watches inputs 0 .. inputCount - 1.
  ACTiEID(Camera* camera, int inputCount);
  ~ACTiEID() override;

  // One poll: sets active to false, then returns 0 when CheckDIStatusByCGI succeeded, else -1.
  int DoEID(bool& active);
  // Reads the camera's input status (a base-16 number, of which only the two lowest bits
  // count); active when the bit of a watched input is 0. 0 on success, -1 when the request
  // failed or the number overflowed.
  int CheckDIStatusByCGI(bool& active);

  int EventDetecor() override;

 private:
  Camera* camera_;  // not owned
  int input_count_;
};

#endif  // EVWATCH_DETECTORS_ACTI_ACTIDETECTOR_H_
