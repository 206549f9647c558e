#include "fs/SharedURLs.h"

namespace mirabel {

const URL& SharedURLs::at(std::string_view path) {
  while (path.size() > 1 && path.ends_with('/'))
    path.remove_suffix(1);
  if (const auto found = urls_.find(std::string(path)); found != urls_.end()) return found->second;
  const std::size_t slash = path.rfind('/');
  if (slash == std::string_view::npos || slash + 1 == path.size()) {
    return urls_.emplace(path, URL::fileURL(path)).first->second;
  }
  const URL folder = at(slash == 0 ? "/" : path.substr(0, slash));
  return urls_.emplace(path, folder.appendingPathComponent(path.substr(slash + 1))).first->second;
}

}  // namespace mirabel
