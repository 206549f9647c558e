#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "linux/operations/FileCalls.h"
#include "linux/operations/FileCopy.h"
#include "linux/operations/OperationProgress.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Copies one object, a folder with everything in it, under a name that is free. Links are copied
/// as links, several names of one file in the tree become several names of the copy. Contents, user
/// attributes, permissions and modification times are kept. Depth is bounded by memory only. When
/// `run` returns without an error, all of the copy is on disk but for the name itself. Used by one
/// thread; the calls and the progress outlive it.
class TreeCopy {
 public:
  TreeCopy(const FileCalls& calls, OperationProgress& progress, CopyKind kind)
      : calls_(calls), progress_(progress), files_(calls, progress, kind) {}

  /// Copies (`sourceFolder`, `source`) to (`folder`, `name`); an empty `source` is the object that
  /// the descriptor holds. After a failure what was made of the copy is left. POSIX errors, with
  /// the path below the source: EAGAIN for a file that keeps changing while it is read.
  [[nodiscard]] Result<void> run(int sourceFolder, const std::string& source, int folder,
                                 const std::string& name);

 private:
  struct Place {
    int folder;
    const std::string& name;
  };
  [[nodiscard]] Result<void> copyObject(Place from, const ObjectStatus& status, Place to,
                                        const std::string& path);
  [[nodiscard]] Result<void> copyFile(Place from, const ObjectStatus& status, Place to,
                                      const std::string& path);
  [[nodiscard]] Result<void> copyTree(int source, int copy);
  [[nodiscard]] Result<void> copyFolder(int source, int copy, const std::string& path);
  [[nodiscard]] Result<void> finishFolder(int source, int copy, const std::string& path);

  const FileCalls& calls_;
  OperationProgress& progress_;
  FileCopy files_;
  std::vector<std::string> folders_;  ///< below the top, a parent before its children
  /// Where the copy of a file with several names lies below the top, by device and inode.
  std::map<std::pair<std::uint64_t, std::uint64_t>, std::string> linked_;
  int top_ = -1;  ///< of the copy
};

}  // namespace mirabel
