#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// How many folders the user may watch at once, all programs together.
struct WatchLimits {
  /// Nothing where the kernel does not say, and for one mark on a file system.
  std::optional<std::uint64_t> allowed;
  std::string setting;  ///< what to raise, as sysctl names it

  [[nodiscard]] static WatchLimits of(WatcherKind kind);
};

}  // namespace mirabel
