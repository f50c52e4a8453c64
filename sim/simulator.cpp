#include "sim/simulator.h"

#include <chrono>
#include <random>

#include "sim/controlapi.h"

namespace evsim {

// One simulated camera: its state and the servers that answer for it.
struct Simulator::Station {
  CameraState state;
  std::unique_ptr<HttpServer> server;
  std::unique_ptr<TcpServer> tcp;  // null when the emulation has no TCP service
};

namespace {

// What every simulated camera does before its maker's handler: count the request, fall
// silent when told to (hold the connection, answer nothing), ask for credentials.
void Serve(HttpConnection& connection, CameraState& state, const Emulation& emulation,
           const HttpAuth& auth, const Login& login, int tcp_port) {
  state.CountRequest();
  if (state.Get().silent) {
    while (!connection.PeerClosed() && connection.SleepFor(std::chrono::milliseconds(100))) {
    }
    return;
  }
  if (!auth.Accepts(connection.Request())) {
    connection.Write(auth.Challenge());
    return;
  }
  if (emulation.handle_with_tcp_port) {
    emulation.handle_with_tcp_port(connection, state, tcp_port);
  } else if (emulation.handle_with_login) {
    emulation.handle_with_login(connection, state, login);
  } else {
    emulation.handle(connection, state);
  }
}

// The same for a connection to the camera's TCP service: counted as a request, held
// unanswered while the camera is silent.
void ServeTcp(TcpConnection& connection, CameraState& state, const Emulation& emulation,
              const Login& login) {
  state.CountRequest();
  if (state.Get().silent) {
    while (!connection.PeerClosed() && connection.SleepFor(std::chrono::milliseconds(100))) {
    }
    return;
  }
  emulation.tcp_service(connection, state, login);
}

// The addresses to try, in order, for a camera whose TCP service has a fixed port.
std::vector<std::string> FixedPortHosts(const std::string& option) {
  if (option != "auto") return {option};
  std::vector<std::string> hosts = {"127.0.0.1"};
  std::mt19937 random(std::random_device{}());
  std::uniform_int_distribution<int> octet(1, 254);
  for (int i = 0; i < 64; ++i) {
    hosts.push_back("127." + std::to_string(octet(random)) + "." + std::to_string(octet(random)) +
                    "." + std::to_string(octet(random)));
  }
  return hosts;
}

}  // namespace

Simulator::Simulator() = default;

Simulator::~Simulator() { Stop(); }

bool Simulator::Start(const SimOptions& options, std::string* error) {
  std::vector<const Emulation*> chosen;
  if (options.emulations.empty()) {
    for (const Emulation& e : Emulations()) chosen.push_back(&e);
  }
  for (const std::string& key : options.emulations) {
    const Emulation* e = FindEmulation(key);
    if (e == nullptr) {
      *error = "unknown emulation \"" + key + "\"";
      return false;
    }
    chosen.push_back(e);
  }
  if (options.count < 1) {
    *error = "the camera count must be at least 1";
    return false;
  }

  const HttpAuth auth = options.auth == AuthScheme::kNone
                            ? HttpAuth()
                            : HttpAuth(options.auth, options.user, options.password);
  const Login login{options.auth != AuthScheme::kNone, options.user, options.password};
  for (const Emulation* e : chosen) {
    for (int n = 1; n <= options.count; ++n) {
      auto station = std::make_unique<Station>();
      CameraState* state = &station->state;
      int tcp_port = 0;
      std::string host = options.host;
      std::string own_host;  // set for a camera on an address of its own
      auto tcp_session = [state, e, login](TcpConnection& c) { ServeTcp(c, *state, *e, login); };
      if (e->tcp_service && e->fixed_tcp_port > 0) {
        if (!options.fixed_port_host.empty()) {
          for (const std::string& candidate : FixedPortHosts(options.fixed_port_host)) {
            auto tcp = std::make_unique<TcpServer>(tcp_session, candidate, e->fixed_tcp_port);
            if (tcp->Port() != e->fixed_tcp_port) continue;
            station->tcp = std::move(tcp);
            tcp_port = e->fixed_tcp_port;
            host = own_host = candidate;
            break;
          }
          if (!station->tcp) {
            *error = "cannot listen on " + options.fixed_port_host + " port " +
                     std::to_string(e->fixed_tcp_port) + " for camera " + e->key +
                     std::to_string(n) + " (another simulator may hold it; try --fixed-port-host auto)";
            Stop();
            return false;
          }
        }
      } else if (e->tcp_service) {
        station->tcp = std::make_unique<TcpServer>(tcp_session, options.host, 0);
        tcp_port = station->tcp->Port();
      }
      station->server = std::make_unique<HttpServer>(
          [state, e, auth, login, tcp_port](HttpConnection& c) {
            Serve(c, *state, *e, auth, login, tcp_port);
          },
          host, 0);
      if (station->server->Port() <= 0 || (station->tcp && tcp_port <= 0)) {
        *error = "cannot listen on " + host + " for camera " + e->key + std::to_string(n);
        Stop();
        return false;
      }
      cameras_.push_back(SimCamera{e->key + std::to_string(n), e, station->server->Port(), state,
                                   tcp_port, own_host});
      stations_.push_back(std::move(station));
    }
  }

  // The handler reads cameras_, which stays fixed until Stop() has stopped this server.
  control_ = std::make_unique<HttpServer>(
      [this](HttpConnection& c) { HandleControlRequest(c, cameras_, ControlPort()); },
      options.host, options.control_port);
  control_port_ = control_->Port();
  if (control_port_ <= 0) {
    *error = "cannot listen on " + options.host + " port " + std::to_string(options.control_port) +
             " for the control API";
    Stop();
    return false;
  }

  if (options.scenario) {
    std::vector<CameraState*> states;
    for (const SimCamera& c : cameras_) states.push_back(c.state);
    player_ = std::make_unique<ScenarioPlayer>(Scenario::Demo(static_cast<int>(states.size())),
                                               states);
  }
  return true;
}

void Simulator::Stop() {
  if (player_) player_->Stop();
  if (control_) control_->Stop();
  control_port_ = 0;
  for (auto& station : stations_) {
    station->server->Stop();
    if (station->tcp) station->tcp->Stop();
  }
  player_.reset();
  control_.reset();
  stations_.clear();
  cameras_.clear();
}

int Simulator::ControlPort() const { return control_port_; }

const SimCamera* Simulator::Find(const std::string& name) const {
  for (const SimCamera& c : cameras_) {
    if (c.name == name) return &c;
  }
  return nullptr;
}

nlohmann::json Simulator::Describe() const {
  nlohmann::json list = nlohmann::json::array();
  for (const SimCamera& c : cameras_) list.push_back(CameraJson(c));
  return {{"control_port", ControlPort()}, {"cameras", list}};
}

}  // namespace evsim
