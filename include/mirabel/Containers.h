#pragma once

#include <string_view>

namespace mirabel {

// Containers that are no folders, each named as a folder is: by its identifier.

/// The documents, and the app libraries beside them.
inline constexpr std::string_view VesselRootContainerItemIdentifier =
    "VesselRootContainerItemIdentifier";
/// Everything that is shown, in folders of any depth.
inline constexpr std::string_view VesselWorkingSetContainerItemIdentifier =
    "VesselWorkingSetContainerItemIdentifier";
/// Every folder, and nothing else.
inline constexpr std::string_view VesselAllDirectoriesContainerItemIdentifier =
    "VesselAllDirectoriesContainerItemIdentifier";

/// The page that starts a listing. Its bytes are those of the text.
inline constexpr std::string_view VesselInitialPageSortedByName = "VesselInitialPageSortedByName";

}  // namespace mirabel
