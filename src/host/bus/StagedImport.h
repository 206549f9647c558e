#pragma once

#include <string>
#include <utility>

#include "linux/operations/FileCalls.h"
#include "mirabel/Error.h"

namespace mirabel::bus {

/// What came as an open file, copied to where it can be imported from under its name. It is read
/// through the descriptor alone, so that a caller gets in what it could read, and nothing else. The
/// copy goes with this; what a crash leaves is cleared when the service starts.
class StagedImport {
 public:
  /// `file` is left open, with its position where it was. The copy has its permissions; that of a
  /// file without a name, which nobody chose any for, is the user's alone. POSIX errors: EBADF
  /// where it is not open for reading, EISDIR, ENOTSUP for what is no regular file; EINVAL and
  /// ENAMETOOLONG for the name; EAGAIN for a file that is written to all the time; those of
  /// writing, and of the check of `calls`, which may have it end.
  [[nodiscard]] static Result<StagedImport> of(int file, const std::string& name,
                                               const std::string& stagingFolder,
                                               const FileCalls& calls);
  StagedImport(StagedImport&& other) noexcept : folder_(std::exchange(other.folder_, {})) {
    path_.swap(other.path_);
  }
  StagedImport& operator=(StagedImport&&) = delete;
  ~StagedImport();

  [[nodiscard]] const std::string& path() const { return path_; }

  /// Removes what is left of others; there must be none.
  static void clear(const std::string& stagingFolder);

 private:
  StagedImport() = default;
  std::string folder_;  ///< of its own; empty when there is nothing to remove
  std::string path_;
};

}  // namespace mirabel::bus
