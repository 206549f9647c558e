#pragma once

#include "foundation/Error.h"
#include "foundation/URL.h"

namespace mirabel {

/// Changes to the file system. Any thread may call it.
class FileOperations {
 public:
  virtual ~FileOperations() = default;
  /// Creates the folder and what is missing above it; one that exists is no error. POSIX errors.
  [[nodiscard]] virtual Result<void> createDirectory(const URL& url) = 0;
};

}  // namespace mirabel
