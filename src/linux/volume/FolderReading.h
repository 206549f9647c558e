#pragma once

#include <optional>
#include <vector>

#include "linux/kernel/RawDirectory.h"
#include "linux/volume/VolumeIndex.h"
#include "mirabel/Error.h"

namespace mirabel {

/// A folder that is being read.
struct FolderReading {
  UniqueFd folder;
  ObjectStatus status;                    ///< of itself, when reading it began
  std::optional<RawDirectory> directory;  ///< until the end was reached
  std::vector<Sighting> entries{};        ///< what was read last: those that are there, as they are
  std::size_t deadMounts = 0;             ///< met so far: of these nothing can be told
  [[nodiscard]] bool isAtEnd() const { return !directory; }
};

/// Begins to read an open folder, which was watched before. POSIX errors.
[[nodiscard]] Result<FolderReading> beginReading(UniqueFd folder);
/// Reads the next entries, one transaction's worth, and looks at them: on two threads where they
/// are many. POSIX errors, with the name of what could not be looked at.
[[nodiscard]] Result<void> readNext(FolderReading& reading);

}  // namespace mirabel
