// ACTi cameras. Two text CGIs answer KEY='value' lines ended by an empty line:
// /cgi-bin/cmd/system?PORT_CONTROL gives the control port, and /cgi-bin/cmd/mpeg4?DIO_STATUS
// the digital inputs as a hexadecimal number in which bit i is 0 while input i is active
// (the camera's inputs 0 and 1 are the simulator's inputs 1 and 2).
//
// Motion comes over the control port, a raw TCP connection of little-endian 32-bit records:
// tag "ACTi", type, payload length, payload. The client logs in with a bare 128-byte packet
// (user name at 0, the value 1 at 32, password at 64) and gets a 128-byte reply whose first
// byte is 0 when the login is accepted. The camera then sends a motion record (type 65593)
// every 200 ms while it sees motion, an input-status record (another type) now and then while
// it does not, and answers each live request (type 48) with a record of that type. Without a
// live request for a minute it drops the connection.

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr char kControlPortPath[] = "/cgi-bin/cmd/system?PORT_CONTROL";
constexpr char kInputStatusPath[] = "/cgi-bin/cmd/mpeg4?DIO_STATUS";
constexpr int kActiInputs = 2;

constexpr size_t kLoginSize = 128;
constexpr size_t kUserSize = 32;
constexpr size_t kFlagOffset = 32;
constexpr size_t kPasswordOffset = 64;
constexpr size_t kPasswordSize = 64;
constexpr size_t kReplySize = 128;
constexpr size_t kHeaderSize = 12;
// Longest payload taken from a client; our clients send none.
constexpr int32_t kMaxClientPayload = 1024;

constexpr uint32_t kMotionType = 65593;
constexpr uint32_t kInputStatusType = 65592;
constexpr uint32_t kLiveRequestType = 48;

constexpr milliseconds kLoginWait{10000};
constexpr milliseconds kTick{200};
constexpr milliseconds kStatusEvery{10000};
constexpr milliseconds kLiveRequestLimit{60000};

std::string Le32(uint32_t value) {
  std::string bytes(4, '\0');
  for (int i = 0; i < 4; ++i) bytes[i] = static_cast<char>((value >> (8 * i)) & 0xff);
  return bytes;
}

uint32_t GetLe32(const std::string& bytes, size_t offset) {
  uint32_t value = 0;
  for (int i = 3; i >= 0; --i) value = (value << 8) | static_cast<unsigned char>(bytes[offset + i]);
  return value;
}

std::string Record(uint32_t type, const std::string& payload = "") {
  return "ACTi" + Le32(type) + Le32(static_cast<uint32_t>(payload.size())) + payload;
}

// Bit i is 0 while the camera's input i is active; the bits above its inputs read 0.
unsigned InputBits(const CameraStatus& status) {
  unsigned bits = 0;
  for (int i = 0; i < kActiInputs; ++i) {
    if (!status.Input(i + 1)) bits |= 1u << i;
  }
  return bits;
}

std::string KeyLine(const std::string& key, const std::string& value) {
  return key + "='" + value + "'\r\n\r\n";
}

void HandleActi(HttpConnection& connection, CameraState& state, int tcp_port) {
  const HttpRequest& request = connection.Request();
  if (request.method == "GET" && request.target == kControlPortPath) {
    connection.Write(MakeResponse(200, "text/plain", KeyLine("PORT_CONTROL", std::to_string(tcp_port))));
    return;
  }
  if (request.method == "GET" && request.target == kInputStatusPath) {
    char hex[16];
    snprintf(hex, sizeof(hex), "%02X", InputBits(state.Get()));
    connection.Write(MakeResponse(200, "text/plain", KeyLine("DIO_STATUS", hex)));
    return;
  }
  AnswerNotFound(connection);
}

// The text of a zero-padded field, up to its first NUL.
std::string Field(const std::string& packet, size_t offset, size_t size) {
  std::string field = packet.substr(offset, size);
  return field.substr(0, field.find('\0'));
}

bool LoginAccepted(const std::string& packet, const Login& login) {
  if (packet.substr(kFlagOffset, 4) != Le32(1)) return false;
  if (!login.required) return true;
  return Field(packet, 0, kUserSize) == login.user.substr(0, kUserSize - 1) &&
         Field(packet, kPasswordOffset, kPasswordSize) ==
             login.password.substr(0, kPasswordSize - 1);
}

// Takes the complete records out of `pending`; returns how many live requests they held, or
// -1 when the client sent something that is not a record.
int TakeLiveRequests(std::string& pending) {
  int requests = 0;
  while (pending.size() >= kHeaderSize) {
    const int32_t length = static_cast<int32_t>(GetLe32(pending, 8));
    if (pending.compare(0, 4, "ACTi") != 0 || length < 0 || length > kMaxClientPayload) return -1;
    if (pending.size() < kHeaderSize + static_cast<size_t>(length)) break;
    if (GetLe32(pending, 4) == kLiveRequestType) ++requests;
    pending.erase(0, kHeaderSize + static_cast<size_t>(length));
  }
  return requests;
}

void ServeControlPort(TcpConnection& connection, CameraState& state, const Login& login) {
  std::string packet;
  if (!connection.ReadExactly(kLoginSize, packet, kLoginWait)) return;
  std::string reply(kReplySize, '\0');
  if (!LoginAccepted(packet, login)) {
    reply[0] = 1;
    connection.Write(reply);
    return;
  }
  // The whole reply block goes out alone, so a client reading it cannot take a record with it.
  if (!connection.Write(reply)) return;

  Clock::time_point lastLiveRequest = Clock::now();
  Clock::time_point nextStatus = Clock::now() + kStatusEvery;
  std::string pending;
  for (;;) {
    CameraStatus status = state.Get();
    if (!status.silent) {
      std::string out;
      if (status.motion > 0) {
        out = Record(kMotionType, Le32(static_cast<uint32_t>(status.motion)) + Le32(1));
      } else if (Clock::now() >= nextStatus) {
        out = Record(kInputStatusType, Le32(InputBits(status)));
        nextStatus = Clock::now() + kStatusEvery;
      }
      if (!out.empty() && !connection.Write(out)) return;
    }
    // The wait for the client is the pace of the records.
    const Clock::time_point tickEnd = Clock::now() + kTick;
    for (milliseconds left = kTick; left.count() > 0;
         left = std::chrono::duration_cast<milliseconds>(tickEnd - Clock::now())) {
      char chunk[256];
      long got = connection.Read(chunk, sizeof(chunk), left);
      if (got == 0 || connection.Stopping()) return;
      if (got < 0) {
        if (errno != EAGAIN) return;
        break;
      }
      pending.append(chunk, static_cast<size_t>(got));
      int requests = TakeLiveRequests(pending);
      if (requests < 0) return;
      if (requests > 0) lastLiveRequest = Clock::now();
      for (int i = 0; i < requests && !state.Get().silent; ++i) {
        if (!connection.Write(Record(kLiveRequestType))) return;
      }
    }
    if (Clock::now() - lastLiveRequest > kLiveRequestLimit) return;
  }
}

}  // namespace

Emulation ActiEmulation() {
  Emulation e = MakeEmulation("acti", "ACTi", nullptr,
                             {
                                 {"ACTiMD", "motion", nullptr},
                                 {"ACTiEID", "inputs", {{"inputs", 2}}},
                             });
  e.handle_with_tcp_port = HandleActi;
  e.tcp_service = ServeControlPort;
  return e;
}

}  // namespace evsim
