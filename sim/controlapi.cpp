#include "sim/controlapi.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "sim/camstate.h"
#include "sim/simulator.h"

namespace evsim {
namespace {

using nlohmann::json;

bool ParseInt(std::string_view text, int* out) {
  if (text.empty()) return false;
  auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), *out);
  return ec == std::errc() && end == text.data() + text.size();
}

bool ParseFlag(std::string_view text, bool* out) {
  if (text == "1" || text == "true" || text == "on") {
    *out = true;
  } else if (text == "0" || text == "false" || text == "off") {
    *out = false;
  } else {
    return false;
  }
  return true;
}

void Reply(HttpConnection& connection, int status, const json& body) {
  connection.Write(MakeResponse(status, "application/json", body.dump() + "\n"));
}

void ReplyError(HttpConnection& connection, int status, const std::string& message) {
  Reply(connection, status, json{{"error", message}});
}

// "/cameras/door/set" -> {"cameras", "door", "set"}
std::vector<std::string_view> Segments(std::string_view path) {
  std::vector<std::string_view> out;
  while (!path.empty()) {
    size_t slash = path.find('/');
    std::string_view part = path.substr(0, slash);
    if (!part.empty()) out.push_back(part);
    if (slash == std::string_view::npos) break;
    path.remove_prefix(slash + 1);
  }
  return out;
}

}  // namespace

std::optional<StateChange> StateChange::Parse(std::string_view query, std::string* error) {
  StateChange change;
  bool any = false;
  while (!query.empty()) {
    size_t amp = query.find('&');
    std::string_view pair = query.substr(0, amp);
    query = amp == std::string_view::npos ? std::string_view() : query.substr(amp + 1);
    if (pair.empty()) continue;
    size_t eq = pair.find('=');
    std::string_view name = pair.substr(0, eq);
    std::string_view value = eq == std::string_view::npos ? std::string_view() : pair.substr(eq + 1);
    int number = 0;
    bool flag = false;
    if (name == "motion" && ParseInt(value, &number) && number >= 0 && number <= 100) {
      change.motion = number;
    } else if (name == "inputs" && ParseFlag(value, &flag)) {
      change.all_inputs = flag;
    } else if (name == "silent" && ParseFlag(value, &flag)) {
      change.silent = flag;
    } else if (name.substr(0, 5) == "input" && ParseInt(name.substr(5), &number) &&
               number >= 1 && number <= kInputCount && ParseFlag(value, &flag)) {
      change.inputs.emplace_back(number, flag);
    } else {
      *error = "bad parameter \"" + std::string(pair) +
               "\" (expected motion=0..100, input1..input8=0|1, inputs=0|1, silent=0|1)";
      return std::nullopt;
    }
    any = true;
  }
  if (!any) {
    *error = "nothing to set";
    return std::nullopt;
  }
  return change;
}

void StateChange::ApplyTo(CameraState& state) const {
  if (motion) state.SetMotion(*motion);
  if (all_inputs) state.SetAllInputs(*all_inputs);
  for (const auto& [number, active] : inputs) state.SetInput(number, active);
  if (silent) state.SetSilent(*silent);
}

json CameraJson(const SimCamera& camera) {
  CameraStatus status = camera.state->Get();
  json inputs = json::array();
  for (bool on : status.inputs) inputs.push_back(on ? 1 : 0);
  json out{{"name", camera.name},
           {"maker", camera.emulation->maker},
           {"emulation", camera.emulation->key},
           {"port", camera.port},
           {"classes", camera.emulation->classes},
           {"state",
            {{"motion", status.motion},
             {"inputs", inputs},
             {"silent", status.silent},
             {"requests", camera.state->Requests()}}}};
  if (!camera.host.empty()) out["host"] = camera.host;
  return out;
}

void HandleControlRequest(HttpConnection& connection, const std::vector<SimCamera>& cameras,
                          int control_port) {
  const HttpRequest& request = connection.Request();
  if (request.method != "GET") return ReplyError(connection, 405, "only GET is served");
  const std::string path = request.Path();  // parts point into it
  std::vector<std::string_view> parts = Segments(path);
  if (parts.empty() || parts[0] != "cameras" || parts.size() > 3 ||
      (parts.size() == 3 && parts[2] != "set")) {
    return ReplyError(connection, 404, "no such resource: " + path);
  }
  if (parts.size() == 1) {
    json list = json::array();
    for (const SimCamera& c : cameras) list.push_back(CameraJson(c));
    return Reply(connection, 200, json{{"control_port", control_port}, {"cameras", list}});
  }

  std::vector<const SimCamera*> chosen;
  for (const SimCamera& c : cameras) {
    if (parts[1] == "all" || c.name == parts[1]) chosen.push_back(&c);
  }
  if (chosen.empty()) return ReplyError(connection, 404, "no camera " + std::string(parts[1]));

  if (parts.size() == 3) {
    size_t q = request.target.find('?');
    std::string query = q == std::string::npos ? "" : request.target.substr(q + 1);
    std::string error;
    std::optional<StateChange> change = StateChange::Parse(query, &error);
    if (!change) return ReplyError(connection, 400, error);
    for (const SimCamera* c : chosen) change->ApplyTo(*c->state);
  }
  if (parts[1] != "all") return Reply(connection, 200, CameraJson(*chosen[0]));
  json list = json::array();
  for (const SimCamera* c : chosen) list.push_back(CameraJson(*c));
  return Reply(connection, 200, list);
}

}  // namespace evsim
