#pragma once

#include <array>
#include <chrono>
#include <compare>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "mirabel/Export.h"

namespace mirabel {

/// A byte string.
using Data = std::vector<std::uint8_t>;

MIRABEL_EXPORT Data dataFromString(std::string_view bytes);
/// Holds as long as the data does and is not changed.
MIRABEL_EXPORT std::string_view stringView(const Data& data);

/// A moment: seconds since 1970-01-01T00:00:00Z (may be negative) and nanoseconds 0..999,999,999.
struct MIRABEL_EXPORT Date {
  std::int64_t seconds = 0;
  std::uint32_t nanoseconds = 0;

  /// Seconds from 1970 to 2001-01-01T00:00:00Z, the epoch of dates in property lists.
  static constexpr std::int64_t referenceEpoch = 978'307'200;
  /// The bounds of the calendar: years 1 to 9999.
  static const Date earliest;
  static const Date latest;

  static Date now();
  /// Nothing for a value that is no finite number or that no calendar here can print
  /// (outside the years 1 to 9999).
  static std::optional<Date> fromReferenceSeconds(double secondsSince2001);
  /// A double tells moments of this century apart to about 0.1 microseconds.
  [[nodiscard]] double referenceSeconds() const;

  /// RFC 3339 in UTC, with as many fractional digits as are not zero ("2026-11-21T09:30:00.5Z").
  /// A moment outside the calendar prints as the bound that is nearest to it.
  [[nodiscard]] std::string rfc3339() const;
  /// Reads what `rfc3339` writes, any UTC offset, and a bare "YYYY-MM-DD" (midnight UTC).
  static std::optional<Date> fromRFC3339(std::string_view text);

  friend auto operator<=>(const Date&, const Date&) = default;
};

inline constexpr Date Date::earliest{-62'135'596'800, 0};
inline constexpr Date Date::latest{253'402'300'799, 999'999'999};

/// An integer or floating value, as extended attributes and property lists carry them.
struct MIRABEL_EXPORT Number {
  std::variant<std::int64_t, std::uint64_t, double> value;

  static Number of(std::int64_t v) { return {v}; }
  static Number of(std::uint64_t v) { return {v}; }
  static Number of(double v) { return {v}; }

  /// The value as an unsigned integer when it is one, without loss.
  [[nodiscard]] std::optional<std::uint64_t> asUnsigned() const;
  [[nodiscard]] double asDouble() const;
  [[nodiscard]] std::string description() const;

  /// By mathematical value: 3, 3u and 3.0 are equal. Not-a-number equals itself, so that a value
  /// that was written and read back is the same value.
  MIRABEL_EXPORT friend bool operator==(const Number& a, const Number& b);
};

/// A universally unique identifier.
struct MIRABEL_EXPORT UUID {
  std::array<std::uint8_t, 16> bytes{};

  static UUID random();
  /// Reads the canonical 36-character form in either case; nothing for anything else.
  static std::optional<UUID> fromString(std::string_view text);
  /// Canonical 36 characters, upper case.
  [[nodiscard]] std::string description() const;
  [[nodiscard]] bool isNil() const { return *this == UUID{}; }

  friend auto operator<=>(const UUID&, const UUID&) = default;
};

}  // namespace mirabel
