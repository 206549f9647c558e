#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "foundation/URL.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Files below the current user's folder for application support that remember what is costly to
/// find out again, and the numbers that tell their contents apart. Other processes may write the
/// same files. Any thread may call it. Errors are POSIX errors.
class CacheFiles {
 public:
  virtual ~CacheFiles() = default;
  /// Absolute, and the same for the life of the process; the folder need not exist.
  [[nodiscard]] virtual const URL& applicationSupportURL() const = 0;
  /// The whole file; nothing where there is none. EFBIG for one of more than `limit` bytes.
  [[nodiscard]] virtual Result<std::optional<Data>> read(const URL& file, std::size_t limit) = 0;
  /// Creates the folder and what is missing above it; one that exists is no error.
  [[nodiscard]] virtual Result<void> createDirectory(const URL& folder) = 0;
  /// Puts `bytes` in place of what the file held; its folder must exist. A reader, and whoever
  /// looks after a crash, finds the one or the other whole. On disk when this returns.
  [[nodiscard]] virtual Result<void> replace(const URL& file, const Data& bytes) = 0;
  /// A number greater than `after` and than every number that was claimed under `name` before, by
  /// any process; one more than the greatest of them where nothing went wrong. It is on disk when
  /// this returns, and lies with the volume's history: who loses the one loses the other, and so
  /// a number that was given out is never given out again, even where the caches were lost.
  /// EOVERFLOW when there is none left.
  [[nodiscard]] virtual Result<std::uint64_t> claimVersion(std::string_view name,
                                                           std::uint64_t after) = 0;
};

}  // namespace mirabel
