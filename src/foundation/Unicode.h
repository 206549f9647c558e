#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace mirabel {

/// Whether the bytes are UTF-8 by the letter: no overlong forms, no surrogates, nothing above
/// U+10FFFF. NUL is a character like any other.
[[nodiscard]] bool isUTF8(std::string_view bytes);

/// Takes the first character off `rest`, which is not empty; nothing, and `rest` as it was, where
/// no character starts.
[[nodiscard]] std::optional<char32_t> takeUTF8Character(std::string_view& rest);

/// Nothing when the bytes are not UTF-8.
[[nodiscard]] std::optional<std::u16string> utf16FromUTF8(std::string_view bytes);

/// Nothing when a surrogate stands without its other half.
[[nodiscard]] std::optional<std::string> utf8FromUTF16(std::u16string_view units);

}  // namespace mirabel
