#pragma once

#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/PropertyList.h"

namespace mirabel::keyedarchive {

/// Self-describing archives of a single value, checked for their type when read: the payload of
/// the extended attributes and of the cache files. The bytes are a binary property list; see
/// docs/formats/keyed-archive.md. Reading answers an error of domain `propertyList` for bytes
/// that are no archive and for a root of another type. Strings are bytes: one that is not UTF-8
/// comes back as it went in; but the texts within a dictionary must be UTF-8. Writing answers an
/// error of that domain for a date outside the calendar, and for a value that is too large to be
/// read back: 64 KiB for the attributes' classes, 16 MiB for a dictionary.

[[nodiscard]] Result<Data> archiveDate(const Date& date);
[[nodiscard]] Result<Data> archiveNumber(const Number& number);
[[nodiscard]] Result<Data> archiveString(std::string_view string);
[[nodiscard]] Result<Data> archiveStrings(const std::vector<std::string>& strings);
[[nodiscard]] Result<Data> archiveDictionary(const PropertyList::Dictionary& dictionary);

[[nodiscard]] Result<Date> unarchiveDate(std::span<const std::uint8_t> bytes);
[[nodiscard]] Result<Number> unarchiveNumber(std::span<const std::uint8_t> bytes);
[[nodiscard]] Result<std::string> unarchiveString(std::span<const std::uint8_t> bytes);
[[nodiscard]] Result<std::vector<std::string>> unarchiveStrings(
    std::span<const std::uint8_t> bytes);
[[nodiscard]] Result<PropertyList::Dictionary> unarchiveDictionary(
    std::span<const std::uint8_t> bytes);

}  // namespace mirabel::keyedarchive
