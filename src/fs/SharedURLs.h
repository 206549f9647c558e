#pragma once

#include <string>
#include <string_view>
#include <unordered_map>

#include "foundation/URL.h"

namespace mirabel {

/// One URL for each path, as a child of its folder's, so that what has been read of a folder
/// serves for all that lies in it. Caches are not renewed: for the time of one batch.
class SharedURLs {
 public:
  /// `path` is absolute. Valid as long as this.
  [[nodiscard]] const URL& at(std::string_view path);

 private:
  std::unordered_map<std::string, URL> urls_;
};

}  // namespace mirabel
