#include "foundation/Unicode.h"

namespace mirabel {
namespace {

bool isSurrogate(char32_t c) {
  return c >= 0xD800 && c < 0xE000;
}
bool isHighSurrogate(char32_t c) {
  return c >= 0xD800 && c < 0xDC00;
}
bool isLowSurrogate(char32_t c) {
  return c >= 0xDC00 && c < 0xE000;
}

/// What the first byte of a sequence says of the whole.
struct Sequence {
  std::size_t length;
  char32_t firstBits;
  char32_t smallest;  // a smaller value should have been written with fewer bytes
};

std::optional<Sequence> sequenceOf(unsigned char first) {
  if (first < 0x80) return Sequence{1, first, 0};
  if (first >= 0xC0 && first < 0xE0) return Sequence{2, first & 0x1Fu, 0x80};
  if (first >= 0xE0 && first < 0xF0) return Sequence{3, first & 0x0Fu, 0x800};
  if (first >= 0xF0 && first < 0xF8) return Sequence{4, first & 0x07u, 0x10000};
  return std::nullopt;
}

void appendUTF8(std::string& text, char32_t c) {
  const auto append = [&text](char32_t byte) { text.push_back(static_cast<char>(byte)); };
  if (c < 0x80) return append(c);
  if (c < 0x800) {
    append(0xC0 | c >> 6);
    return append(0x80 | (c & 0x3F));
  }
  if (c < 0x10000) {
    append(0xE0 | c >> 12);
  } else {
    append(0xF0 | c >> 18);
    append(0x80 | (c >> 12 & 0x3F));
  }
  append(0x80 | (c >> 6 & 0x3F));
  append(0x80 | (c & 0x3F));
}

}  // namespace

std::optional<char32_t> takeUTF8Character(std::string_view& rest) {
  const auto sequence = sequenceOf(static_cast<unsigned char>(rest.front()));
  if (!sequence || rest.size() < sequence->length) return std::nullopt;
  char32_t character = sequence->firstBits;
  for (const char c : rest.substr(1, sequence->length - 1)) {
    const auto byte = static_cast<unsigned char>(c);
    if ((byte & 0xC0) != 0x80) return std::nullopt;
    character = character << 6 | (byte & 0x3Fu);
  }
  if (character < sequence->smallest || character > 0x10FFFF) return std::nullopt;
  if (isSurrogate(character)) return std::nullopt;
  rest.remove_prefix(sequence->length);
  return character;
}

bool isUTF8(std::string_view bytes) {
  while (!bytes.empty()) {
    if (!takeUTF8Character(bytes)) return false;
  }
  return true;
}

std::optional<std::u16string> utf16FromUTF8(std::string_view bytes) {
  std::u16string units;
  units.reserve(bytes.size());
  while (!bytes.empty()) {
    const auto character = takeUTF8Character(bytes);
    if (!character) return std::nullopt;
    if (*character < 0x10000) {
      units.push_back(static_cast<char16_t>(*character));
      continue;
    }
    const char32_t beyond = *character - 0x10000;
    units.push_back(static_cast<char16_t>(0xD800 + (beyond >> 10)));
    units.push_back(static_cast<char16_t>(0xDC00 + (beyond & 0x3FF)));
  }
  return units;
}

std::optional<std::string> utf8FromUTF16(std::u16string_view units) {
  std::string text;
  text.reserve(units.size());
  for (std::size_t i = 0; i < units.size(); ++i) {
    char32_t character = units[i];
    if (isHighSurrogate(character) && i + 1 < units.size() && isLowSurrogate(units[i + 1])) {
      ++i;
      character = 0x10000 + ((character - 0xD800) << 10) + (units[i] - 0xDC00u);
    }
    if (isSurrogate(character)) return std::nullopt;
    appendUTF8(text, character);
  }
  return text;
}

}  // namespace mirabel
