#include "host/transport/headerlines.h"

#include "host/text/strutil.h"

std::string_view HeaderLineText(const char* data, size_t size) {
  std::string_view line(data, size);
  while (!line.empty() && (line.back() == '\n' || line.back() == '\r')) line.remove_suffix(1);
  return line;
}

void AddHeaderLine(std::string_view line, HeaderList* headers) {
  if (line.empty()) return;
  if (line.front() == ' ' || line.front() == '\t') {
    if (!headers->empty()) headers->back().second += " " + std::string(TrimBlanks(line));
    return;
  }
  const size_t colon = line.find(':');
  if (colon == std::string_view::npos) return;
  headers->emplace_back(std::string(TrimBlanks(line.substr(0, colon))), std::string(TrimBlanks(line.substr(colon + 1))));
}
