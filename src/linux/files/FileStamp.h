#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {

/// What tells the state of a regular file or a folder, and of the place where it lies, from every
/// other: where its contents (of a folder: the names in it), its attributes or its name have
/// changed, the stamp has. Taken before and after something was read of the file, equal, and
/// settled, it says that what was read holds for as long as the same stamp is found at that path.
struct FileStamp {
  ObjectStatus folder;
  ObjectStatus file;
  // On which mount each is: one that was put over a place since is not entered.
  std::uint64_t folderMount = 0;
  std::uint64_t fileMount = 0;
  bool isWritable = false;  ///< a mount may become read-only without a trace on the file

  [[nodiscard]] bool isSameAs(const FileStamp& other) const;
  /// Whether the next change is sure to get another time than the last.
  [[nodiscard]] bool isSettled() const;
};

/// The stamp of what lies at an absolute path, without waiting for a disk; only a file system over
/// a network may ask its server. Nothing for what is no regular file and no folder; where the way
/// there is not in the kernel's memory or leads over a symbolic link; and where the file system
/// keeps no birth times, or the kernel does not tell mounts apart.
[[nodiscard]] std::optional<FileStamp> stampOf(const std::string& path);

}  // namespace mirabel
