#include "detectors/acti/actidetector.h"

#include <errno.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "framework/host/textutil.h"
#include "framework/httpreq.h"
#include "framework/polledloop.h"

namespace {

const char kSourceName[] = "actidetector";
const char kControlPortPath[] = "/cgi-bin/cmd/system?PORT_CONTROL";
const char kControlPortKey[] = "PORT_CONTROL";
const char kInputStatusPath[] = "/cgi-bin/cmd/mpeg4?DIO_STATUS";
const char kInputStatusKey[] = "DIO_STATUS";

const int kLoginSize = 128;
const int kUserOffset = 0;
const int kUserSize = 32;
const int kLoginFlagOffset = 32;
const int kPasswordOffset = 64;
const int kPasswordSize = 64;
const int kReplySize = 128;

const int kKeepAliveIdle = 5;
const int kKeepAliveInterval = 5;
const int kKeepAliveCount = 3;
// The socket's wait for data, in seconds: a silent camera still lets the loop look at its
// run flag about once a second.
const int kReadWait = 1;

const int kHeaderSize = 12;
const int kTypeOffset = 4;
const int kLengthOffset = 8;
const int kPayloadSize = 256;
const uint32_t kMotionRecordType = 65593;
const uint32_t kLiveRequestType = 48;
const char kTag[] = "ACTi";
const unsigned long long kLiveRequestPeriod = 19999999;  // microseconds; a request is due past it

const int kInputMask = 3;

// Wire integers are little-endian; writing them byte by byte keeps the bytes right on a host
// of either byte order.
void PutLe32(char* out, uint32_t value) {
  for (int i = 0; i < 4; ++i) out[i] = static_cast<char>((value >> (8 * i)) & 0xff);
}

uint32_t GetLe32(const char* in) {
  uint32_t value = 0;
  for (int i = 3; i >= 0; --i) value = (value << 8) | static_cast<unsigned char>(in[i]);
  return value;
}

timeval SystemTime() {
  timeval now{};
  gettimeofday(&now, nullptr);
  return now;
}

void BuildLoginPacket(Camera* camera, char* packet) {
  memset(packet, 0, kLoginSize);
  snprintf(packet + kUserOffset, kUserSize, "%s", camera->GetUsername().c_str());
  snprintf(packet + kPasswordOffset, kPasswordSize, "%s", camera->GetPassword().c_str());
  PutLe32(packet + kLoginFlagOffset, 1);
}

// The camera's number as a 32-bit strtol gives it: what does not fit ends at the limits,
// and the limits themselves count as overflow.
bool ParseInputStatus(const std::string& text, long& value) {
  value = strtol(text.c_str(), nullptr, 16);
  return value > INT32_MIN && value < INT32_MAX;
}

}  // namespace

ACTiSocket::ACTiSocket(std::string host, int port, int timeout, bool whole)
    : VoSocket(std::move(host), port, timeout, whole) {}

ACTiSocket::~ACTiSocket() = default;

int ACTiSocket::BuildConnectWithKeepAlive(int idle, int interval, int count) {
  int result = BuildConnect();
  if (result != 0) return result;
  const int on = 1;
  const struct {
    int level;
    int name;
    int value;
  } options[] = {
      {SOL_SOCKET, SO_KEEPALIVE, on},
      {IPPROTO_TCP, TCP_KEEPIDLE, idle},
      {IPPROTO_TCP, TCP_KEEPINTVL, interval},
      {IPPROTO_TCP, TCP_KEEPCNT, count},
  };
  for (const auto& option : options) {
    if (setsockopt(Descriptor(), option.level, option.name, &option.value, sizeof(int)) < 0) {
      return -1;
    }
  }
  return 0;
}

int ChangeEndianInt(unsigned int value) {
  uint32_t v = value;
  return static_cast<int>(((v & 0xffu) << 24) | ((v & 0xff00u) << 8) | ((v >> 8) & 0xff00u) |
                          (v >> 24));
}

int GetControlPort(Camera* camera, int& port) {
  if (camera == nullptr) return -1;
  std::string value;
  if (SendHttpReqAndGetResp(camera, kControlPortPath, kControlPortKey, value) != 0) return -1;
  port = static_cast<int>(strtol(value.c_str(), nullptr, 10));
  return 0;
}

int ControlConnectAuth(Camera* camera, ACTiSocket* socket) {
  if (camera == nullptr || socket == nullptr) return -1;
  if (socket->BuildConnectWithKeepAlive(kKeepAliveIdle, kKeepAliveInterval, kKeepAliveCount) !=
      0) {
    syslog(LOG_ERR, "%s:%d:%s(): Socket connection failed! \n", kSourceName, __LINE__,
           "ControlConnectAuth");
    return -1;
  }
  char packet[kLoginSize];
  BuildLoginPacket(camera, packet);
  if (socket->WriteData(packet, kLoginSize) == -1) return -1;
  char reply[kReplySize];
  memset(reply, 0, kReplySize);
  if (socket->ReadData(reply, kReplySize) <= 0) return -1;
  return reply[0] == 0 ? 0 : -1;
}

ACTiMD::ACTiMD(Camera* camera)
    : camera_(camera), control_port_(0), socket_(nullptr), last_live_request_{},
      now_(SystemTime) {}

ACTiMD::~ACTiMD() {
  StopIfStarted();
  DropConnection();
}

void ACTiMD::SetTimeSource(TimeSource now) { now_ = now ? std::move(now) : SystemTime; }

void ACTiMD::DropConnection() {
  delete socket_;
  socket_ = nullptr;
}

int ACTiMD::OpenControlConnection() {
  if (GetControlPort(camera_, control_port_) != 0) return -1;
  socket_ = new ACTiSocket(camera_->GetHost(), control_port_, kReadWait, false);
  if (ControlConnectAuth(camera_, socket_) != 0) {
    DropConnection();
    return -1;
  }
  ResetLiveReqTimeout();
  return 0;
}

int ACTiMD::DoMD(bool& detected, unsigned int& level) {
  detected = false;
  level = 0;
  if (socket_ == nullptr) return -1;
  char header[kHeaderSize];
  memset(header, 0, sizeof(header));
  int count = socket_->ReadData(header, kHeaderSize);
  if (count < 0 && errno == EAGAIN) return 0;
  // An error, the camera's close, or a short header: the record stream cannot be trusted.
  if (count != kHeaderSize) {
    DropConnection();
    return -1;
  }
  int32_t length = static_cast<int32_t>(GetLe32(header + kLengthOffset));
  if (length > 0) {
    // The payload means nothing to us. Of a longer one only the first 256 bytes are taken
    // here; the rest stays on the connection and is read as the next header.
    char payload[kPayloadSize];
    memset(payload, 0, sizeof(payload));
    int want = length < kPayloadSize ? length : kPayloadSize;
    if (socket_->ReadData(payload, want) < 0) {
      DropConnection();
      return -1;
    }
  }
  if (GetLe32(header + kTypeOffset) == kMotionRecordType) {
    detected = true;
    level = 100;
  }
  return 0;
}

int ACTiMD::CheckLiveReqTimeout() {
  timeval now = now_();
  // Compared unsigned: a clock set back makes the request due at once.
  if (static_cast<unsigned long long>(TimevalDiff(last_live_request_, now)) <=
      kLiveRequestPeriod) {
    return 0;
  }
  last_live_request_ = now;
  return 1;
}

void ACTiMD::ResetLiveReqTimeout() { last_live_request_ = now_(); }

int ACTiMD::SendLiveReq() {
  if (socket_ == nullptr) return -1;
  if (CheckLiveReqTimeout() != 1) return 0;
  char request[kHeaderSize];
  memcpy(request, kTag, 4);
  PutLe32(request + kTypeOffset, kLiveRequestType);
  PutLe32(request + kLengthOffset, 0);
  if (socket_->WriteData(request, kHeaderSize) > 0) return 0;
  DropConnection();
  return -1;
}

int ACTiMD::EventDetecor() {
  if (camera_ == nullptr || event_buffer_ == nullptr) {
    syslog(LOG_ERR, "%s:%d:%s(): No configure file or status buffer\n", kSourceName, __LINE__,
           "EventDetecor");
    return 0;
  }
  while (IsStarted() == 1) {
    bool detected = false;
    unsigned int level = 0;
    if (socket_ == nullptr && OpenControlConnection() != 0) {
      // Nothing is reported while the camera cannot be reached or refuses us.
      sleep(1);
      continue;
    }
    if (DoMD(detected, level) == 0) {
      event_buffer_->SetStatus(detected, static_cast<int>(level));
      SendLiveReq();
    } else {
      // Lost: the next pass reconnects at once.
      event_buffer_->SetStatus(false, 0);
    }
  }
  event_buffer_->SetStatus(false, 0);
  DropConnection();
  return 0;
}

ACTiEID::ACTiEID(Camera* camera, int inputCount) : camera_(camera), input_count_(inputCount) {}

ACTiEID::~ACTiEID() { StopIfStarted(); }

int ACTiEID::CheckDIStatusByCGI(bool& active) {
  active = false;
  if (camera_ == nullptr) return -1;
  std::string value;
  if (SendHttpReqAndGetResp(camera_, kInputStatusPath, kInputStatusKey, value) != 0) return -1;
  long status = 0;
  if (!ParseInputStatus(value, status)) return -1;
  // Only the two lowest bits are read, so an input numbered 2 or more always reads as 0,
  // that is active.
  long bits = status & kInputMask;
  for (int i = 0; i < input_count_; ++i) {
    if (((bits >> i) & 1) == 0) {
      active = true;
      break;
    }
  }
  return 0;
}

int ACTiEID::DoEID(bool& active) {
  active = false;
  return CheckDIStatusByCGI(active) == 0 ? 0 : -1;
}

int ACTiEID::EventDetecor() {
  if (camera_ == nullptr || event_buffer_ == nullptr) return 0;
  RunInputPolledLoop(*this, event_buffer_, kOneSecond,
                     [this](bool& state) { return DoEID(state); });
  return 0;
}
