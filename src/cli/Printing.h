#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "mirabel/Values.h"

namespace mirabel {

/// Text that is safe to show: what is not UTF-8, and every control character, as "\xNN" or "\n".
[[nodiscard]] std::string printable(std::string_view bytes);
/// UTF-8, each byte that is none replaced by U+FFFD; control characters are kept.
[[nodiscard]] std::string utf8Lossy(std::string_view bytes);

/// What a person gave, for a message: an empty text in quotes.
[[nodiscard]] std::string named(const std::string& given);

[[nodiscard]] std::string base64(std::string_view bytes);
/// Nothing for text that is no canonical base64.
[[nodiscard]] std::optional<std::string> fromBase64(std::string_view text);

/// "812 B", "14.2 kB", "3.0 GB": powers of a thousand.
[[nodiscard]] std::string humanSize(std::uint64_t bytes);
/// "1 folder", "2 folders".
[[nodiscard]] std::string counted(std::uint64_t count, std::string_view one,
                                  std::string_view several);
/// "2026-11-21 09:30" in the local time zone.
[[nodiscard]] std::string humanDate(const Date& date);

/// How many columns text takes on a terminal.
[[nodiscard]] std::size_t displayWidth(std::string_view utf8);
/// With spaces before or after it, so that it takes `width` columns; one that takes more is as it
/// was.
enum class Align { left, right };
[[nodiscard]] std::string padded(std::string text, std::size_t width, Align align);

}  // namespace mirabel
