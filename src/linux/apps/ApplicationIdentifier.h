#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace mirabel {

inline constexpr std::string_view desktopEntrySuffix = ".desktop";

/// Whether `text` may be an application's identifier, and so the name of the folder of its
/// container: up to 255 ASCII letters, digits and characters of "-_.+@", the first of them no ".".
[[nodiscard]] bool isApplicationIdentifier(std::string_view text);

/// The identifier that an entry has by its path below the directory of entries: "a/b.desktop" has
/// "a-b", which may still be no `isApplicationIdentifier`. Nothing for what is no entry by its
/// name.
[[nodiscard]] std::optional<std::string> identifierOfEntry(std::string_view relativePath);

}  // namespace mirabel
