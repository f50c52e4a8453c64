#include "sim/makers/inputquery.h"

#include <string>

namespace evsim {
namespace {

// N of a query that is exactly checkactive=N with N in 1..kInputCount; 0 otherwise.
int CheckedInput(const std::string& target) {
  const std::string prefix = "checkactive=";
  const size_t query = target.find('?');
  if (query == std::string::npos || target.compare(query + 1, prefix.size(), prefix) != 0) return 0;
  const std::string digits = target.substr(query + 1 + prefix.size());
  if (digits.empty() || digits.size() > 2) return 0;
  int number = 0;
  for (char c : digits) {
    if (c < '0' || c > '9') return 0;
    number = number * 10 + (c - '0');
  }
  return number <= kInputCount ? number : 0;
}

}  // namespace

bool AnswerInputQuery(HttpConnection& connection, const CameraState& state,
                      std::string_view path, std::string_view content_type) {
  const HttpRequest& request = connection.Request();
  if (request.method != "GET" || request.Path() != path) return false;
  const int input = CheckedInput(request.target);
  if (input == 0) {
    connection.Write(MakeResponse(400, "text/plain", "bad checkactive\r\n"));
    return true;
  }
  const bool active = state.Get().Input(input);
  const std::string line =
      "input" + std::to_string(input) + "=" + (active ? "active" : "inactive") + "\r\n";
  connection.Write(MakeResponse(200, content_type, line));
  return true;
}

}  // namespace evsim
