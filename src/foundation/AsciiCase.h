#pragma once

namespace mirabel {

/// The lower-case letter of an upper-case one of ASCII; anything else as it is, whatever the
/// locale.
[[nodiscard]] constexpr char asciiLower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

}  // namespace mirabel
