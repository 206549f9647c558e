#pragma once

#include <optional>
#include <string>
#include <vector>

#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// The path components of an item's trash folder: those of the item up to the first "Documents",
/// and ".Trash". Nothing for a path that has none of that name.
[[nodiscard]] std::optional<std::vector<std::string>> trashComponents(const URL& item);
/// The folder at these components, "/" being the first. For those that name no file, an error line
/// and the host's invalid-parameter error for `trashComponents`.
[[nodiscard]] Result<URL> trashFolderAt(const std::vector<std::string>& components);
/// Both steps for an item. For one without "Documents" above it, an error line and the host's
/// invalid-parameter error for `sourceURL`.
[[nodiscard]] Result<URL> trashFolderFor(const URL& item);

/// The item's path from the root of its app library, "Notes/a.txt". Nothing for an item that does
/// not lie in the library.
[[nodiscard]] std::optional<std::string> putBackString(const URL& item, const URL& libraryRoot);

}  // namespace mirabel
