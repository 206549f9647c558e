#pragma once

#include "foundation/URL.h"
#include "linux/kernel/MonitoredRoots.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Makes the folder and what is missing above it. Below a root, a symbolic link or a mount point on
/// the way is an error (ELOOP or ENOTDIR, EXDEV) and is not followed, and the root itself is not
/// made: ENOENT where it is missing. Something else than a folder in the way is ENOTDIR. What was
/// made of the way stays when a later step fails.
[[nodiscard]] Result<void> createFolder(const MonitoredRoots& roots, const URL& url);

}  // namespace mirabel
