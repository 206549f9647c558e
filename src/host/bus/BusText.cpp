#include "host/bus/BusText.h"

#include <array>
#include <cstdio>

#include "foundation/Unicode.h"

namespace mirabel::bus {
namespace {

bool isBusCharacter(char32_t c) {
  const bool isNoCharacter = (c >= 0xFDD0 && c <= 0xFDEF) || (c & 0xFFFE) == 0xFFFE;
  return c != 0 && !isNoCharacter;
}

/// Takes the first character off, or the first byte where none starts; whether it may stay.
bool takeBusCharacter(std::string_view& rest) {
  const auto character = takeUTF8Character(rest);
  if (!character) rest.remove_prefix(1);
  return character && isBusCharacter(*character);
}

template <class Replacement>
std::string replacing(std::string_view bytes, Replacement replacement) {
  std::string text;
  while (!bytes.empty()) {
    const std::string_view before = bytes;
    const bool stays = takeBusCharacter(bytes);
    const std::string_view taken = before.substr(0, before.size() - bytes.size());
    text += stays ? std::string(taken) : replacement(taken);
  }
  return text;
}

}  // namespace

bool isBusText(std::string_view text) {
  while (!text.empty())
    if (!takeBusCharacter(text)) return false;
  return true;
}

std::string shown(std::string_view bytes) {
  return replacing(bytes, [](std::string_view) { return std::string("\uFFFD"); });
}

std::string escaped(std::string_view bytes) {
  return replacing(bytes, [](std::string_view refused) {
    std::string all;
    for (const char byte : refused) {
      std::array<char, 8> text{};
      std::snprintf(text.data(), text.size(), "\\x%02x", static_cast<unsigned char>(byte));
      all += text.data();
    }
    return all;
  });
}

}  // namespace mirabel::bus
