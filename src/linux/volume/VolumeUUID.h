#pragma once

#include "foundation/Error.h"
#include "foundation/Values.h"

namespace mirabel {

/// The UUID of the file system that an open descriptor (not O_PATH) or path lies on. Where the
/// kernel or the file system has none, one is made from the file system's ID and type, which is
/// as lasting as those are. POSIX errors.
[[nodiscard]] Result<UUID> volumeUUID(const std::string& folder);

}  // namespace mirabel
