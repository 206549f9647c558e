#pragma once

#include <optional>
#include <string>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The UUID of the file system that a folder lies on. Where the kernel or the file system has none,
/// one is made from the file system's ID and type, which is as lasting as those are. POSIX errors.
[[nodiscard]] Result<UUID> volumeUUID(const std::string& folder);
/// Only the file system's own; nothing where it has none or the kernel does not tell.
[[nodiscard]] std::optional<UUID> kernelVolumeUUID(const std::string& folder);

}  // namespace mirabel
