#pragma once

#include "linux/kernel/MonitoredRoots.h"
#include "platform/FileOperations.h"

namespace mirabel {

/// Changes to the file system. Below a root, a symbolic link or a mount point on the way is an
/// error (ELOOP or ENOTDIR, EXDEV) and is not followed, and the root itself is not made: ENOENT
/// where it is missing. New folders have the permissions that the process's umask leaves.
class LinuxFileOperations final : public FileOperations {
 public:
  /// `roots` outlives the operations.
  explicit LinuxFileOperations(const MonitoredRoots& roots) : roots_(roots) {}

  /// Something else than a folder in the way is ENOTDIR. What was made of the way stays when a
  /// later step fails.
  Result<void> createDirectory(const URL& url) override;

 private:
  const MonitoredRoots& roots_;
};

}  // namespace mirabel
