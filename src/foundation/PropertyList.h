#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// One value of a property list: a boolean, a number, a date, bytes, text (UTF-8), an array or a
/// dictionary with text keys in the order in which they were added.
class PropertyList {
 public:
  using Array = std::vector<PropertyList>;
  using Dictionary = std::vector<std::pair<std::string, PropertyList>>;
  using Value = std::variant<bool, Number, Date, Data, std::string, Array, Dictionary>;

  /// Bounds on what `decode` accepts and `encode` writes. An object is counted each time it is
  /// referred to, so that small input cannot unfold into large values.
  struct Limits {
    std::size_t depth = 64;  ///< objects within each other; 1: the root alone
    std::size_t objects = 1'000'000;
    std::size_t bytes = 64u << 20;  ///< payload of all data, texts and keys together
  };

  PropertyList() : value_(false) {}
  PropertyList(Value value) : value_(std::move(value)) {}

  [[nodiscard]] const Value& value() const { return value_; }
  template <class T>
  [[nodiscard]] const T* as() const {
    return std::get_if<T>(&value_);
  }
  /// The dictionary's entry; null when this is no dictionary or has no such key.
  [[nodiscard]] const PropertyList* find(std::string_view key) const;
  /// That entry where it is an integer of 64 bits without a sign; one that was written as a
  /// floating value is none, though it be whole.
  [[nodiscard]] std::optional<std::uint64_t> unsignedFor(std::string_view key) const;

  /// A byte string that is mostly text, such as a path: text where it is UTF-8, else data.
  [[nodiscard]] static PropertyList ofBytes(std::string_view bytes);
  /// What went into `ofBytes`; nothing when this is neither text nor data.
  [[nodiscard]] std::optional<std::string> bytes() const;

  /// The binary form ("bplist00"); see docs/formats/property-list.md. What it writes, `decode`
  /// reads under the same limits, and gives an equal value (of dates, as much as a double holds).
  /// Errors, of domain `propertyList`: text that is not UTF-8, a date outside the calendar, a key
  /// that a dictionary has twice, a value beyond the limits.
  [[nodiscard]] Result<Data> encode(const Limits& limits) const;
  [[nodiscard]] Result<Data> encode() const;
  /// Reads any well-formed binary property list whose values are of the types above. Strict:
  /// every offset is checked, cycles and duplicate keys are refused, and work is bounded by
  /// `limits` whatever the bytes claim. Errors are of domain `propertyList`.
  [[nodiscard]] static Result<PropertyList> decode(std::span<const std::uint8_t> bytes,
                                                   const Limits& limits);
  [[nodiscard]] static Result<PropertyList> decode(std::span<const std::uint8_t> bytes);

  friend bool operator==(const PropertyList&, const PropertyList&) = default;

 private:
  Value value_;
};

}  // namespace mirabel
