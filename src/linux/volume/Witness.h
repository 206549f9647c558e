#pragma once

#include <array>
#include <cstdint>
#include <optional>

#include "linux/volume/StateFolder.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"
#include "mirabel/Values.h"

namespace mirabel {

/// What is remembered of the volume's database outside it, in the file "witness": enough to find
/// out that the database was lost, or replaced by an older copy, and to go on without giving an
/// identity to a second thing. 96 bytes, little endian, replaced atomically but for the end:
///
///     0  8  "MRBWITN2"
///     8 16  UUID of the history
///    24  8  document IDs below this may have been handed out
///    32  8  file IDs of the upper range below this may have been handed out
///    40  8  size of the closed database in bytes; 0: it was not closed in order
///    48  8  modification time of the closed database in nanoseconds
///    56  8  digest of this file's handle; 0: the file system has none that lasts
///    64  8  birth time of this file in nanoseconds; 0: the file system has none
///    72  8  folding: how often the log was moved into the database
///    80  8  commits: how many the database has acknowledged
///    88  8  digest of the 88 bytes before
///
/// From `folding` on the file is written in place after each commit, without waiting for the disk:
/// that costs a microsecond instead of a second sync. A process that is killed leaves it exact.
/// After a loss of power it may be behind the database by what the kernel had not written yet
/// (half a minute), but never ahead of it.
///
/// The file knows itself, so that a copy of it is known as one: it may be as old as the database
/// beside it, and then says nothing.
class Witness {
 public:
  UUID history;
  std::uint64_t documentLimit = 0;
  std::uint64_t fileLimit = 0;
  std::uint64_t closedSize = 0;
  std::int64_t closedTime = 0;
  std::uint64_t foldings = 0;
  std::uint64_t commits = 0;

  /// Nothing when there is none, or none that can be read, or a copy.
  [[nodiscard]] static std::optional<Witness> read(const StateFolder& folder);
  /// Durable when it returns. POSIX errors; the old one stays.
  [[nodiscard]] Result<void> write(const StateFolder& folder);
  /// Notes `foldings` and `commits` in place; does nothing before the file was read or written.
  /// POSIX errors.
  [[nodiscard]] Result<void> note();

 private:
  using Bytes = std::array<unsigned char, 96>;
  void putNotes(Bytes& bytes) const;

  UniqueFd file_;
  Bytes bytes_{};  ///< what the file holds
};

}  // namespace mirabel
