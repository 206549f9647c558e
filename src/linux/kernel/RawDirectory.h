#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

#include "foundation/ResourceValues.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Reads the entries of an open folder straight from the kernel, a buffer at a time.
class RawDirectory {
 public:
  struct Entry {
    std::string_view name;  ///< valid until the next call; NUL-terminated
    std::uint64_t inode;
    std::int64_t position;  ///< where the entry after this one starts, for `seek`
    unsigned char type;     ///< DT_…; DT_UNKNOWN on some file systems
  };

  /// Takes the descriptor, which must be open for reading (not O_PATH). `bufferSize` is what one
  /// call to the kernel may bring.
  explicit RawDirectory(UniqueFd folder, std::size_t bufferSize = 32u << 10);

  /// The next entry, "." and ".." among them; nothing at the end. POSIX errors.
  [[nodiscard]] Result<std::optional<Entry>> next();
  [[nodiscard]] Result<void> seek(std::int64_t position);
  [[nodiscard]] int descriptor() const { return folder_.get(); }
  [[nodiscard]] Result<void> close();

 private:
  UniqueFd folder_;
  std::size_t capacity_;
  std::unique_ptr<char[]> buffer_;
  std::size_t filled_ = 0;
  std::size_t next_ = 0;
};

/// The kind that a directory record's type tells; `other` for DT_UNKNOWN.
FileKind kindOfDirectoryType(unsigned char type);

}  // namespace mirabel
