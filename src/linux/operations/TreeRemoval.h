#pragma once

#include <string>
#include <vector>

#include "linux/operations/FileCalls.h"
#include "linux/operations/OperationProgress.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Removes a folder with everything in it, on descriptors: nothing that is put in the way meanwhile
/// leads out of it, links are removed and not followed, other file systems are not entered. Depth
/// is bounded by memory only. Used by one thread; the calls and the progress outlive it.
class TreeRemoval {
 public:
  TreeRemoval(const FileCalls& calls, OperationProgress& progress)
      : calls_(calls), progress_(progress) {}

  /// Looks whether every folder of the tree open as `top` lets its entries be removed, and notes
  /// the folders for `run`. Nothing is changed. POSIX errors with the folder's path below `top`.
  [[nodiscard]] Result<void> examine(int top);
  /// Removes what lies in `top`, which is the folder that was examined, wherever it has been moved
  /// since. What failed is left with all that holds it; the rest goes. The first error.
  [[nodiscard]] Result<void> run(int top);
  [[nodiscard]] bool hasRemoved() const { return hasRemoved_; }

 private:
  [[nodiscard]] Result<void> emptyFolder(int folder);
  [[nodiscard]] Result<void> removeEntry(int folder, const FolderEntry& entry);
  [[nodiscard]] Result<void> removeNewFolder(int folder, const std::string& name);

  const FileCalls& calls_;
  OperationProgress& progress_;
  std::vector<std::string> folders_;  ///< below `top`, a parent before its children
  bool hasRemoved_ = false;
  bool looksAgain_ = true;  ///< at a folder that was filled after it had been emptied
};

}  // namespace mirabel
