// TCP client socket of the host, used from one thread at a time.
//
// VoSocket(host, port, timeout, whole): `timeout` is in seconds (at least 1) and bounds the
// connection and each wait for data. The flag `whole` chooses how ReadData fills its buffer:
//   true:  ReadData waits until all `size` bytes are in, the peer closes, or a wait for more
//          times out (then it returns what it has);
//   false: ReadData returns what one wait delivers: the bytes that have arrived (at most
//          `size`) as soon as any have.
// Either way a read that gets no data within the time-out returns -1 with errno set to
// EAGAIN, so a caller can tell "nothing yet" from a broken connection (-1 with another
// errno) and from the peer's orderly close (0).

#ifndef EVWATCH_FRAMEWORK_HOST_VOSOCKET_H_
#define EVWATCH_FRAMEWORK_HOST_VOSOCKET_H_

#include <string>

class VoSocket {
 public:
  VoSocket(std::string host, int port, int timeout, bool whole);
  VoSocket(const VoSocket&) = delete;
  VoSocket& operator=(const VoSocket&) = delete;
  virtual ~VoSocket();  // closes the connection

  // Connects (IPv4 or IPv6, names resolved, each address tried in turn within the
  // time-out); an open connection is closed first. 0 = connected; -1 otherwise.
  int BuildConnect();
  // Closes the connection; harmless when not connected.
  void DisConnect();
  // See the file comment. Returns the count read, 0 when the peer closed, -1 on error or
  // time-out (errno EAGAIN when nothing arrived in time).
  int ReadData(char* buffer, int size);
  // Reads one line without its line end (LF or CR LF), zero-terminated, at most size - 1
  // characters (a longer line is cut and its rest is the next line). Returns the characters
  // stored; -1 on error, on a time-out (errno EAGAIN; a line begun stays for the next call),
  // after the peer's close when nothing is left, or when size < 2. The last line before a
  // close may lack its line end.
  int ReadToLineEnd(char* buffer, int size);
  // Writes all `size` bytes. Returns size, or -1 on failure or time-out.
  int WriteData(char* buffer, int size);

 protected:
  // The connected descriptor, -1 when not connected (subclasses set socket options on it).
  int Descriptor() const { return fd_; }

 private:
  int WaitReadable();  // 1 readable, 0 time-out, -1 error

  std::string host_;
  int port_;
  int timeout_;
  bool whole_;
  int fd_;  // -1 when not connected
  std::string pending_;  // bytes read past a line end, served before the socket
};

#endif  // EVWATCH_FRAMEWORK_HOST_VOSOCKET_H_
