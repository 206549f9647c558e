#pragma once

#include <optional>
#include <string>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/ObjectMatcher.h"

namespace mirabel {

/// An entry looked at by path, with the folder kept open so that it can be looked at again.
struct DiskEntry {
  UniqueFd folder;
  SeenObject seen;
};

/// Looks at what is at `path`, a root or below one without following links, or outside of them.
/// A mount point is looked at and not entered. POSIX errors.
[[nodiscard]] Result<DiskEntry> lookAt(const MonitoredRoots& roots, const std::string& path);

}  // namespace mirabel
