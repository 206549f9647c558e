#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <shared_mutex>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "linux/kernel/LongPath.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// The folders that are presented: the document storage, and further ones, which may be thousands
/// and may change. Everything below them is reached through descriptors, without following a
/// symbolic link and without crossing onto another file system, so that nothing put in the way can
/// lead out of the tree. Paths may be of any length. Any thread may call it.
class MonitoredRoots {
 public:
  /// Paths are absolute and resolved; the first is the document storage, which is kept open, and
  /// stands for the same folder between two calls of `refresh`, and for one on the same file system
  /// always. One that does not exist is kept and is simply empty.
  explicit MonitoredRoots(std::vector<std::string> paths);
  ~MonitoredRoots();

  /// Replaces all but the first. Those that stay are not looked at anew.
  void setFurther(const std::vector<std::string>& paths);

  struct Changes {
    bool isFirst = false;                ///< the document storage is among them
    std::vector<std::string> further{};  ///< the paths of others
  };
  /// Looks whether each root is still the folder at its path: one may have been moved away, made
  /// since, or have something mounted on it; a further one may also have been opened, or closed.
  /// Answers those that changed. One that can't be looked at for a passing reason, such as too many
  /// open files, is as it was; the document storage also where a folder above it is closed.
  [[nodiscard]] Changes refresh();

  struct Place {
    std::uint64_t root;         ///< a number that no other root gets in the life of this
    std::string_view rootPath;  ///< the beginning of the path that was asked for
    std::string_view relative;  ///< below the root, without a leading "/"; empty for the root
  };
  /// The root that holds `path`, by whole components; nothing for a path outside.
  [[nodiscard]] std::optional<Place> locate(std::string_view path) const;

  /// All of them, the document storage first.
  [[nodiscard]] std::vector<std::string> paths() const;
  [[nodiscard]] const std::string& firstPath() const { return firstPath_; }
  /// Whether there was a folder at the path of that root when it was looked at last; false for a
  /// path that is no root's.
  [[nodiscard]] bool isThere(std::string_view rootPath) const;
  /// The file system of the document storage when it was first looked at, or of the folder that it
  /// would have been made in. An error where it is not there and the last look failed for a passing
  /// reason: then nobody knows, and `open` fails with that error too.
  [[nodiscard]] Result<std::uint64_t> volume() const;
  /// Looks whether the path of the document storage leads to another file system than that: one was
  /// mounted there, or went away. It stands for the folder of before all the same.
  [[nodiscard]] bool hasLeftVolume() const;

  /// Opens the object at `path` with `flags` (O_PATH, or O_RDONLY | O_DIRECTORY, …; O_NOFOLLOW,
  /// O_CLOEXEC and O_NONBLOCK are added). A path outside the roots is opened as it stands, its
  /// final link not followed. POSIX errors: ELOOP for a symbolic link on the way, EXDEV for
  /// another mount and for a subvolume, ENOENT; EACCES for a folder that is to be read and is
  /// closed (see `isClosed`), and for all that lies in one, whatever the kernel would let through:
  /// it holds nothing. Of the document storage, closed itself, it is always `closedStorage`.
  [[nodiscard]] Result<UniqueFd> open(const std::string& path, int flags) const;
  /// Opens the folder at `path` with O_PATH, to look at what lies in it. The same errors.
  [[nodiscard]] Result<UniqueFd> openHolder(const std::string& path) const;

 private:
  struct Root;
  using RootPointer = std::shared_ptr<Root>;
  struct Hash {
    using is_transparent = void;
    std::size_t operator()(std::string_view path) const {
      return std::hash<std::string_view>()(path);
    }
  };
  [[nodiscard]] RootPointer holderOf(std::string_view path) const;
  [[nodiscard]] std::vector<RootPointer> all() const;
  [[nodiscard]] static bool refresh(Root& root);

  std::string firstPath_;
  RootPointer first_;
  mutable std::shared_mutex mutex_;
  std::vector<RootPointer> further_;  // with mutex_, as are the next two
  std::unordered_map<std::string, RootPointer, Hash, std::equal_to<>> furtherByPath_;
  std::uint64_t nextNumber_ = 1;
};

}  // namespace mirabel
