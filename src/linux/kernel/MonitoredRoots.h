#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/Error.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/UniqueFd.h"

namespace mirabel {

/// The folders that are presented, kept open. Everything below them is reached through their
/// descriptors, without following a symbolic link and without crossing onto another file system,
/// so that nothing put in the way can lead out of the tree. Paths may be of any length. Any thread
/// may call it.
class MonitoredRoots {
 public:
  /// Paths are absolute and resolved. One that does not exist is kept and is simply empty.
  explicit MonitoredRoots(std::vector<std::string> paths);
  ~MonitoredRoots();

  /// Looks whether each root is still the folder at its path: one may have been moved away, made
  /// since, or have something mounted on it. Whether any of them changed; those are open anew then.
  [[nodiscard]] bool refresh();

  struct Place {
    std::size_t root;
    std::string_view relative;  ///< below the root, without a leading "/"; empty for the root
  };
  /// The root that holds `path`, by whole components; nothing for a path outside.
  [[nodiscard]] std::optional<Place> locate(std::string_view path) const;

  [[nodiscard]] const std::vector<std::string>& paths() const { return paths_; }
  /// Negative for a root that is not there. Stays open for a while when the root has changed.
  [[nodiscard]] int descriptor(std::size_t root) const;

  /// Opens the object at `path` with `flags` (O_PATH, or O_RDONLY | O_DIRECTORY, …; O_NOFOLLOW,
  /// O_CLOEXEC and O_NONBLOCK are added). A path outside the roots is opened as it stands, its
  /// final link not followed. POSIX errors: ELOOP for a symbolic link on the way, EXDEV for
  /// another mount and for a subvolume, ENOENT.
  [[nodiscard]] Result<UniqueFd> open(const std::string& path, int flags) const;

 private:
  struct Root;
  std::vector<std::string> paths_;
  std::vector<std::unique_ptr<Root>> roots_;
};

}  // namespace mirabel
