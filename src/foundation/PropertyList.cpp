#include "foundation/PropertyList.h"

#include "foundation/Unicode.h"

namespace mirabel {

const PropertyList* PropertyList::find(std::string_view key) const {
  const auto* dictionary = as<Dictionary>();
  if (dictionary == nullptr) return nullptr;
  for (const auto& [name, value] : *dictionary) {
    if (name == key) return &value;
  }
  return nullptr;
}

PropertyList PropertyList::ofBytes(std::string_view bytes) {
  if (isUTF8(bytes)) return PropertyList(std::string(bytes));
  return PropertyList(dataFromString(bytes));
}

std::optional<std::uint64_t> PropertyList::unsignedFor(std::string_view key) const {
  const PropertyList* entry = find(key);
  const Number* number = entry == nullptr ? nullptr : entry->as<Number>();
  if (number == nullptr || std::holds_alternative<double>(number->value)) return {};
  return number->asUnsigned();
}

std::optional<std::string> PropertyList::bytes() const {
  if (const auto* text = as<std::string>()) return *text;
  if (const auto* data = as<Data>()) return std::string(stringView(*data));
  return std::nullopt;
}

Result<Data> PropertyList::encode() const {
  return encode(Limits{});
}

Result<PropertyList> PropertyList::decode(std::span<const std::uint8_t> bytes) {
  return decode(bytes, Limits{});
}

}  // namespace mirabel
