#pragma once

#include <cstdint>
#include <string>

#include "linux/kernel/MonitoredRoots.h"
#include "mirabel/Error.h"

namespace mirabel {

/// A folder open for reading its entries, and the file system it is on.
struct OpenedFolder {
  UniqueFd descriptor;
  std::uint64_t device = 0;
};

/// Opens the folder at `path` to be read. POSIX errors, those of `MonitoredRoots::open` among them.
[[nodiscard]] Result<OpenedFolder> openFolderForReading(const MonitoredRoots& roots,
                                                        const std::string& path);

}  // namespace mirabel
