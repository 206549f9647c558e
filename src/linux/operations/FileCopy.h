#pragma once

#include <string>
#include <vector>

#include "linux/operations/FileCalls.h"
#include "linux/operations/OperationProgress.h"
#include "mirabel/Error.h"

namespace mirabel {

/// A copy stays beside its source; what is moved replaces it, so that it keeps its owner too, and
/// is compared with its source once it is on disk.
enum class CopyKind { copy, move };

/// What is copied of a mode: the bits that let a program run as somebody else are not handed on.
inline constexpr std::uint16_t copiedPermissions = 0777;

/// Copies the contents of files and what goes with them. Files are synchronised some at a time,
/// since the file system then writes them out together. Used by one thread.
class FileCopy {
 public:
  FileCopy(const FileCalls& calls, OperationProgress& progress, CopyKind kind)
      : calls_(calls), progress_(progress), kind_(kind) {}

  /// Copies the regular file that is open as `source` into a new file (`folder`, `name`). It is on
  /// disk only after `flush`. The errors of `copyWhole`.
  [[nodiscard]] Result<void> copy(UniqueFd source, int folder, const std::string& name);
  /// Copies the contents of the regular file that is open as `source` into the empty one that is
  /// open as `copy`, and answers what the source was like meanwhile. Its position moves, unless it
  /// is somebody else's too: then holes are filled. EAGAIN when the source changed each time that
  /// it was read.
  enum class Position { own, shared };
  [[nodiscard]] Result<ObjectStatus> copyWhole(int source, int copy, Position position);
  /// Has all that was copied on disk. POSIX errors, EIO for a copy that is not like its source.
  [[nodiscard]] Result<void> flush();

  /// Gives what is open as `copy` the user attributes, the owner where it is a move, permissions
  /// and modification time of the object with `status` that is open as `source`.
  [[nodiscard]] Result<void> copyProperties(int source, const ObjectStatus& status, int copy) const;

 private:
  [[nodiscard]] Result<void> copyContents(int source, const ObjectStatus& status, int copy,
                                          Position position);
  [[nodiscard]] Result<bool> clone(int source, int copy);
  [[nodiscard]] Result<void> copyRange(int source, int copy, std::int64_t from, std::int64_t to);
  [[nodiscard]] Result<void> copyByHand(int source, int copy, std::int64_t from, std::int64_t to);
  [[nodiscard]] Result<void> copyAttributes(int source, int copy) const;
  [[nodiscard]] Result<void> compareContents(int source, int copy) const;

  struct Pair {
    UniqueFd source;  ///< for a move only
    UniqueFd copy;
  };
  const FileCalls& calls_;
  OperationProgress& progress_;
  CopyKind kind_;
  bool mayClone_ = true;  ///< the file systems have not said that they can't
  bool mayCopyInKernel_ = true;
  std::vector<Pair> unsynced_;
};

}  // namespace mirabel
