#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// What a person may raise where the user can have no further watcher (EMFILE).
inline constexpr std::string_view watcherSettings =
    "\"fs.fanotify.max_user_groups\" and \"fs.inotify.max_user_instances\" with sysctl, or those "
    "of "
    "\"user.\" where a container has its own";

/// How many folders the user may watch at once, all programs together.
struct WatchLimits {
  /// Nothing where the kernel does not say, and for one mark on a file system.
  std::optional<std::uint64_t> allowed;
  std::string setting;  ///< what to raise, as sysctl names it

  [[nodiscard]] static WatchLimits of(WatcherKind kind);
};

}  // namespace mirabel
