#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/PropertyList.h"

/// What the reader and the writer of binary property lists share; see
/// docs/formats/property-list.md.
namespace mirabel::bplist {

inline constexpr std::string_view magic = "bplist00";
inline constexpr std::size_t trailerSize = 32;
/// Where the trailer's fields begin. Everything before is unused.
inline constexpr std::size_t offsetSizeField = 6;
inline constexpr std::size_t referenceSizeField = 7;
inline constexpr std::size_t objectCountField = 8;
inline constexpr std::size_t topObjectField = 16;
inline constexpr std::size_t offsetTableField = 24;

/// The high half of an object's first byte.
enum class Kind : std::uint8_t {
  constant = 0x0,  // false and true
  integer = 0x1,
  real = 0x2,
  date = 0x3,
  data = 0x4,
  asciiText = 0x5,
  utf16Text = 0x6,
  array = 0xA,
  dictionary = 0xD,
};

inline constexpr std::uint8_t falseMarker = 0x08;
inline constexpr std::uint8_t trueMarker = 0x09;
inline constexpr std::uint8_t dateMarker = 0x33;
/// The low half of a first byte that says: the count follows as an integer object.
inline constexpr std::uint8_t countFollows = 0xF;

/// Depth, objects and payload that are left of the limits.
class Budget {
 public:
  explicit Budget(const PropertyList::Limits& limits) : left_(limits) {}

  [[nodiscard]] bool takeObjects(std::size_t count) { return take(left_.objects, count); }
  [[nodiscard]] bool takeBytes(std::size_t count) { return take(left_.bytes, count); }
  [[nodiscard]] bool enter() { return take(left_.depth, 1); }
  void leave() { ++left_.depth; }

 private:
  static bool take(std::size_t& left, std::size_t count) {
    if (count > left) return false;
    left -= count;
    return true;
  }
  PropertyList::Limits left_;
};

/// Whether a key stands twice.
inline bool hasDuplicates(const PropertyList::Dictionary& dictionary) {
  std::vector<std::string_view> keys;
  keys.reserve(dictionary.size());
  for (const auto& entry : dictionary) {
    keys.push_back(entry.first);
  }
  std::ranges::sort(keys);
  return std::ranges::adjacent_find(keys) != keys.end();
}

}  // namespace mirabel::bplist
