#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// One name in a folder. The name is valid until the next call on the stream.
struct DirectoryEntry {
  std::string_view name;
  FileKind kind = FileKind::other;
};

/// The names of one folder in the file system's own order, "." and ".." among them. Used by one
/// thread at a time.
class DirectoryStream {
 public:
  virtual ~DirectoryStream() = default;
  /// Nothing at the end; a read error ends the stream too.
  [[nodiscard]] virtual std::optional<DirectoryEntry> next() = 0;
  /// Where the next entry is to be found by another stream of the same folder, in another process
  /// too: what has not changed in the meantime comes from one of the two, once. Nothing where the
  /// file system promises nothing of the kind.
  [[nodiscard]] virtual std::optional<std::uint64_t> position() = 0;
  /// POSIX errors. The destructor closes silently when this was not called.
  [[nodiscard]] virtual Result<void> close() = 0;
};

/// Opens folders for reading. Any thread may call it.
class DirectoryStreams {
 public:
  virtual ~DirectoryStreams() = default;
  /// A symbolic link below a monitored folder is not followed (POSIX error ELOOP or ENOTDIR), and
  /// neither is the mount point of another file system entered (EXDEV).
  [[nodiscard]] virtual Result<std::unique_ptr<DirectoryStream>> open(const URL& folder) = 0;
  /// The same, for a page of the names that come from such a position on.
  [[nodiscard]] virtual Result<std::unique_ptr<DirectoryStream>> openAt(const URL& folder,
                                                                        std::uint64_t position) = 0;
};

}  // namespace mirabel
