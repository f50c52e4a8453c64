// The table of camera emulations: for each camera maker, how its cameras answer (a request
// handler that reads a CameraState) and which evwatch detector entries watch such a camera.
//
// Adding a maker: write its emulation in its own file (sim/makers/<maker>_emu.cpp; makers
// that share an interface share one) as a function returning an Emulation, and add that
// function to the table in emulation.cpp.
//
// Threads: the table is built once and read-only after that. A handler runs on a server
// connection thread, several at once for one camera.

#ifndef EVWATCH_SIM_EMULATION_H_
#define EVWATCH_SIM_EMULATION_H_

#include <functional>
#include <optional>
#include <nlohmann/json.hpp>
#include <string>
#include <string_view>
#include <vector>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"
#include "sim/net/tcpserver.h"

namespace evsim {

// The credentials that the simulated cameras ask of clients, for a TCP service that checks a
// login of its own (the simulator checks HTTP requests itself). required false: any login.
struct Login {
  bool required = false;
  std::string user;
  std::string password;
};

// One detector entry of an evwatch configuration for a camera of this emulation.
struct DetectorEntry {
  std::string cls;         // detector class name
  std::string name;        // the entry's name within its camera
  nlohmann::json fields;   // further keys of the entry (inputs, type, ...); an object or null
};

struct Emulation {
  std::string key;                   // short lower-case name for command lines ("canon")
  std::string maker;                 // the maker as people write it ("Canon")
  std::vector<std::string> classes;  // the detector classes that it serves
  // Answers one request as the maker's camera does, from the camera's state. Runs after the
  // simulator has checked credentials and silence.
  std::function<void(HttpConnection&, CameraState&)> handle;
  std::vector<DetectorEntry> detectors;  // the entries that watch such a camera
  // The camera's `api:` block for a camera listening on `port`; null when it needs none.
  std::function<nlohmann::json(int port)> api;
  // Optional: the camera's `frames:` block (the multipart source that evwatch's receiver
  // copies into the camera's frame buffer) for a camera listening on `port`.
  std::function<nlohmann::json(int port)> frames;
  // Optional: a raw TCP service that the camera runs beside its HTTP server, on a second
  // port of its own (a binary control connection). Serves one accepted connection on its
  // own thread; the connection closes when it returns. Runs after the simulator has counted
  // the connection and waited out silence.
  std::function<void(TcpConnection&, CameraState&, const Login&)> tcp_service;
  // Optional, for a camera with a TCP service: the port the service must listen on, for a
  // camera whose clients always connect to that port. Such a camera listens on an address
  // of its own (SimOptions::fixed_port_host); 0: a free port on the simulator's address.
  int fixed_tcp_port = 0;
  // Optional, for a camera with a TCP service: answers an HTTP request in place of `handle`,
  // knowing the service's port (the camera's CGIs tell clients where it listens).
  std::function<void(HttpConnection&, CameraState&, int tcp_port)> handle_with_tcp_port;
  // Optional: answers an HTTP request in place of `handle`, for a camera that also checks
  // credentials inside the request itself (a SOAP service's UsernameToken).
  std::function<void(HttpConnection&, CameraState&, const Login&)> handle_with_login;
  // Optional, for a camera with a TCP service that the camera API names (an RTSP server):
  // the camera's `api:` block for a camera whose HTTP server listens on `port` and whose TCP
  // service listens on `tcp_port`; used in place of `api`.
  std::function<nlohmann::json(int port, int tcp_port)> api_with_tcp_port;
  // Optional: the camera's stream type and video type (Camera::GetStmType, GetVideoType),
  // for detectors that choose their stream by them.
  std::optional<int> stream_type;
  std::optional<int> video_type;
};

// An emulation whose classes are those of its detector entries, in the order they first come.
Emulation MakeEmulation(std::string key, std::string maker,
                        std::function<void(HttpConnection&, CameraState&)> handle,
                        std::vector<DetectorEntry> detectors);

// An `api:` block (for Emulation::api) naming the stream at `path` on the camera's own port,
// and the API's name when `name` is not empty.
std::function<nlohmann::json(int port)> StreamApi(std::string path, std::string name = "");

// A `frames:` block (for Emulation::frames): the multipart source at `path` on the camera's
// own port.
std::function<nlohmann::json(int port)> FramesAt(std::string path);

// What a camera answers for a request it does not serve: 404, "not found".
void AnswerNotFound(HttpConnection& connection);

// True when the request is a GET of `path` (the target without its query), for the caller to
// answer; else answers it with AnswerNotFound and returns false.
bool ServesGetOf(HttpConnection& connection, std::string_view path);

// Every emulation, in a fixed order.
const std::vector<Emulation>& Emulations();
// The emulation of that key (exact match), or null.
const Emulation* FindEmulation(std::string_view key);
// The emulation that serves detector class `cls`, or null.
const Emulation* EmulationForClass(std::string_view cls);

}  // namespace evsim

#endif  // EVWATCH_SIM_EMULATION_H_
