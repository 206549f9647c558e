#pragma once

#include <string>
#include <string_view>

namespace mirabel::bus {

// The bus takes UTF-8 without NUL and without the points that Unicode has set aside as no
// characters for text, and refuses a whole message for anything else.

[[nodiscard]] bool isBusText(std::string_view text);
/// The same text with U+FFFD for what can't be.
[[nodiscard]] std::string shown(std::string_view bytes);
/// The same text with "\xe9" for each byte of what can't be.
[[nodiscard]] std::string escaped(std::string_view bytes);

}  // namespace mirabel::bus
