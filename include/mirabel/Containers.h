#pragma once

#include <string_view>

namespace mirabel {

// Containers that are no folders, each named as a folder is: by its identifier.

/// The documents, and the app libraries beside them: one level.
inline constexpr std::string_view VesselRootContainerItemIdentifier =
    "VesselRootContainerItemIdentifier";
/// Everything that is shown, in folders of any depth: the documents, the app libraries and what
/// lies in them; then what lies in the trash, with `isTrashed`, but not what is in a folder there.
inline constexpr std::string_view VesselWorkingSetContainerItemIdentifier =
    "VesselWorkingSetContainerItemIdentifier";
/// Every folder that is shown, but for the app libraries themselves, and nothing else.
inline constexpr std::string_view VesselAllDirectoriesContainerItemIdentifier =
    "VesselAllDirectoriesContainerItemIdentifier";

/// The page that starts a listing: `dataFromString` makes it. Items come in the order of the disk,
/// whatever the name says.
inline constexpr std::string_view VesselInitialPageSortedByName = "VesselInitialPageSortedByName";

}  // namespace mirabel
