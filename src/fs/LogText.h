#pragma once

#include <string>
#include <vector>

#include "foundation/URL.h"

namespace mirabel {

/// ["one", "two"], as log lines show lists of texts.
[[nodiscard]] std::string listOfTexts(const std::vector<std::string>& texts);
/// The same for the paths of URLs.
[[nodiscard]] std::string listOfPaths(const std::vector<URL>& urls);
/// [file:///one, file:///two]
[[nodiscard]] std::string listOfURLs(const std::vector<URL>& urls);
/// An object's address: "0x7f…".
[[nodiscard]] std::string addressText(const void* object);

}  // namespace mirabel
