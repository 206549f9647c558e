#include "cli/Printing.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <ctime>
#include <cwchar>
#include <optional>

#include "foundation/Unicode.h"

namespace mirabel {
namespace {

// Controls, and what reorders or hides the text around it.
bool isUnsafe(char32_t point) {
  static constexpr struct {
    char32_t first, last;
  } ranges[] = {{0, 0x1F},        {0x7F, 0x9F},     {0xAD, 0xAD},      {0x61C, 0x61C},
                {0x180E, 0x180E}, {0x200B, 0x200F}, {0x2028, 0x202E},  {0x2060, 0x206F},
                {0xFEFF, 0xFEFF}, {0xFFF9, 0xFFFB}, {0xE0000, 0xE007F}};
  return std::ranges::any_of(
      ranges, [&](const auto& range) { return point >= range.first && point <= range.last; });
}

void appendEscaped(std::string& text, std::string_view bytes) {
  for (const char c : bytes) {
    if (c == '\n') {
      text += "\\n";
    } else if (c == '\t') {
      text += "\\t";
    } else {
      std::array<char, 8> escaped{};
      std::snprintf(escaped.data(), escaped.size(), "\\x%02x", static_cast<unsigned char>(c));
      text += escaped.data();
    }
  }
}

constexpr std::string_view alphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

}  // namespace

std::string printable(std::string_view bytes) {
  std::string text;
  text.reserve(bytes.size());
  while (!bytes.empty()) {
    const std::string_view before = bytes;
    const auto character = takeUTF8Character(bytes);
    if (!character) bytes.remove_prefix(1);
    const std::string_view taken = before.substr(0, before.size() - bytes.size());
    if (!character || isUnsafe(*character)) {
      appendEscaped(text, taken);
    } else {
      text += taken;
    }
  }
  return text;
}

std::string utf8Lossy(std::string_view bytes) {
  std::string text;
  while (!bytes.empty()) {
    const std::string_view before = bytes;
    if (takeUTF8Character(bytes)) {
      text += before.substr(0, before.size() - bytes.size());
    } else {
      text += "\xEF\xBF\xBD";
      bytes.remove_prefix(1);
    }
  }
  return text;
}

std::string named(const std::string& given) {
  return given.empty() ? "\"\"" : given;
}

std::string base64(std::string_view bytes) {
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  for (std::size_t i = 0; i < bytes.size(); i += 3) {
    const std::size_t count = std::min<std::size_t>(3, bytes.size() - i);
    std::uint32_t group = 0;
    for (std::size_t k = 0; k < 3; ++k) {
      group = (group << 8) | (k < count ? static_cast<unsigned char>(bytes[i + k]) : 0U);
    }
    for (std::size_t k = 0; k < 4; ++k) {
      text += k <= count ? alphabet[(group >> (18 - 6 * k)) & 63] : '=';
    }
  }
  return text;
}

std::optional<std::string> fromBase64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  std::string bytes;
  for (std::size_t i = 0; i < text.size(); i += 4) {
    std::uint32_t group = 0;
    std::size_t count = 3;
    for (std::size_t k = 0; k < 4; ++k) {
      const char c = text[i + k];
      const bool isPadding = c == '=' && i + 4 == text.size() && k >= 2;
      const std::size_t digit = isPadding ? 0 : alphabet.find(c);
      if (digit == std::string_view::npos) return std::nullopt;
      if (isPadding) count = std::min(count, k - 1);
      group = (group << 6) | static_cast<std::uint32_t>(digit);
    }
    for (std::size_t k = 0; k < count; ++k) {
      bytes += static_cast<char>((group >> (16 - 8 * k)) & 0xFF);
    }
  }
  // Unused bits that are set, and digits after padding, would give two texts for the same bytes.
  return base64(bytes) == text ? std::optional(bytes) : std::nullopt;
}

std::string humanSize(std::uint64_t bytes) {
  if (bytes < 1000) return std::to_string(bytes) + " B";
  static constexpr std::array<const char*, 6> units = {"kB", "MB", "GB", "TB", "PB", "EB"};
  double value = static_cast<double>(bytes) / 1000;
  std::size_t unit = 0;
  while (value >= 999.95 && unit + 1 < units.size()) {
    value /= 1000;
    ++unit;
  }
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%.1f %s", value, units[unit]);
  return text.data();
}

std::string counted(std::uint64_t count, std::string_view one, std::string_view several) {
  return std::to_string(count) + " " + std::string(count == 1 ? one : several);
}

std::string humanDate(const Date& date) {
  const std::time_t seconds = date.seconds;
  std::tm local{};
  std::array<char, 64> text{};
  if (::localtime_r(&seconds, &local) == nullptr ||
      std::strftime(text.data(), text.size(), "%Y-%m-%d %H:%M", &local) == 0) {
    return "?";
  }
  return text.data();
}

std::size_t displayWidth(std::string_view utf8) {
  std::size_t width = 0;
  while (!utf8.empty()) {
    const auto character = takeUTF8Character(utf8);
    if (!character) utf8.remove_prefix(1);
    const int columns = character ? ::wcwidth(static_cast<wchar_t>(*character)) : 1;
    width += columns < 0 ? 1 : static_cast<std::size_t>(columns);
  }
  return width;
}

std::string padded(std::string text, std::size_t width, Align align) {
  const std::size_t has = displayWidth(text);
  if (has >= width) return text;
  const std::string spaces(width - has, ' ');
  return align == Align::right ? spaces + text : text + spaces;
}

}  // namespace mirabel
