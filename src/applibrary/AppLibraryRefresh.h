#pragma once

#include <optional>
#include <vector>

#include "applibrary/LocalAppLibraryCache.h"
#include "mirabel/Error.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// The applications that show their documents, the user's before the system's, each in the order
/// of the registry: those with a data container that either browse documents themselves or both
/// open them in place and share their files. Errors are the registry's.
[[nodiscard]] Result<std::vector<BundleProxy>> retrieveAppLibraries(ApplicationRegistry& registry);

/// Writes what the registry tells into the main cache where that differs from what the cache
/// holds, and answers whether it did. A failure of either is logged, and leaves file and token.
/// One call at a time in a process; other processes may do the same. `latest`, if given, gets what
/// the registry told, if it told anything: the cache may hold display names of before.
[[nodiscard]] Result<bool> refreshMainCache(
    ApplicationRegistry& registry, LocalAppLibraryCache& mainCache,
    std::optional<std::vector<BundleProxy>>* latest = nullptr);

}  // namespace mirabel
