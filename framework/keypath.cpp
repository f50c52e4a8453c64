#include "framework/keypath.h"

void SplitKeyPath(const std::string& key, std::list<std::string>& path) {
  std::string::size_type start = 0;
  for (std::string::size_type slash = key.find('/'); slash != std::string::npos;
       slash = key.find('/', start)) {
    path.push_back(key.substr(start, slash - start));
    start = slash + 1;
  }
  if (start < key.size()) path.push_back(key.substr(start));
}
