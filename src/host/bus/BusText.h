#pragma once

#include <string>
#include <string_view>

namespace mirabel::bus {

// The bus takes UTF-8 without NUL for text, and refuses a whole message for anything else.

[[nodiscard]] bool isBusText(std::string_view text);
/// The same text with U+FFFD for each byte that can't be.
[[nodiscard]] std::string shown(std::string_view bytes);
/// The same text with "\xE9" for each byte that can't be.
[[nodiscard]] std::string escaped(std::string_view bytes);

}  // namespace mirabel::bus
