#pragma once

#include <optional>
#include <vector>

#include "foundation/PropertyList.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// Application records in a cache file: of each, what an app library is built from. One record is
/// a dictionary of "bundleIdentifier", "dataContainerURL" (the path) and "localizedName", each
/// text or data, and left out where the record has none; see docs/formats/app-library-cache.md.
[[nodiscard]] PropertyList archivedBundleProxies(const std::vector<BundleProxy>& records);

/// Nothing where any of it is no such record: an entry of the wrong type, a container that is no
/// absolute path. Keys that are not known are ignored.
[[nodiscard]] std::optional<std::vector<BundleProxy>> unarchivedBundleProxies(
    const PropertyList& value);

}  // namespace mirabel
