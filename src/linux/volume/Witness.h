#pragma once

#include <cstdint>
#include <optional>

#include "foundation/Error.h"
#include "foundation/Values.h"
#include "linux/volume/StateFolder.h"

namespace mirabel {

/// What is remembered of the volume's database outside it, in the file "witness": enough to find
/// out that the database was damaged, lost or replaced by an older copy, and to go on without
/// giving an identity to a second thing. 80 bytes, little endian, replaced atomically:
///
///     0  8  "MRBWITN1"
///     8 16  UUID of the history
///    24  8  session: how often the database was opened for writing
///    32  8  document IDs below this may have been handed out
///    40  8  file IDs of the upper range below this may have been handed out
///    48  8  size of the closed database in bytes
///    56  8  its modification time in nanoseconds
///    64  8  digest of its bytes; 0: it was not closed in order
///    72  8  digest of the 72 bytes before
struct Witness {
  UUID history;
  std::uint64_t session = 0;
  std::uint64_t documentLimit = 0;
  std::uint64_t fileLimit = 0;
  std::uint64_t closedSize = 0;
  std::int64_t closedTime = 0;
  std::uint64_t closedDigest = 0;

  /// Nothing when there is none, or none that can be read.
  [[nodiscard]] static std::optional<Witness> read(const StateFolder& folder);
  /// Durable when it returns. POSIX errors; the old one stays.
  [[nodiscard]] Result<void> write(const StateFolder& folder) const;
};

/// 64 bits over the bytes of a file, never 0. POSIX errors.
[[nodiscard]] Result<std::uint64_t> digestOfFile(const std::string& path);

}  // namespace mirabel
