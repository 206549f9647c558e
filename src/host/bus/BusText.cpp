#include "host/bus/BusText.h"

#include <array>
#include <cstdio>

#include "foundation/Unicode.h"

namespace mirabel::bus {
namespace {

template <class Replacement>
std::string replacing(std::string_view bytes, Replacement replacement) {
  std::string text;
  while (!bytes.empty()) {
    const std::string_view before = bytes;
    const auto character = takeUTF8Character(bytes);
    if (character && *character != 0) {
      text += before.substr(0, before.size() - bytes.size());
    } else {
      text += replacement(static_cast<unsigned char>(before.front()));
      if (!character) bytes.remove_prefix(1);
    }
  }
  return text;
}

}  // namespace

bool isBusText(std::string_view text) {
  return isUTF8(text) && text.find('\0') == std::string_view::npos;
}

std::string shown(std::string_view bytes) {
  return replacing(bytes, [](unsigned char) { return std::string("\uFFFD"); });
}

std::string escaped(std::string_view bytes) {
  return replacing(bytes, [](unsigned char byte) {
    std::array<char, 8> text{};
    std::snprintf(text.data(), text.size(), "\\x%02x", byte);
    return std::string(text.data());
  });
}

}  // namespace mirabel::bus
