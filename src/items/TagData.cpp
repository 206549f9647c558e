#include "mirabel/TagData.h"

#include <utility>

#include "foundation/PropertyList.h"

namespace mirabel {
namespace {

// Far above what people do: the tags come from a host and are kept in one extended attribute.
constexpr PropertyList::Limits tagLimits{.depth = 3, .objects = 64u << 10, .bytes = 1u << 20};

/// A tag that a host wrote without a color has none.
std::optional<int> colorOf(const PropertyList& entry) {
  const PropertyList* color = entry.find("color");
  if (color == nullptr) return 0;
  const auto* number = color->as<Number>();
  const auto* value = number == nullptr ? nullptr : std::get_if<std::int64_t>(&number->value);
  if (value == nullptr || !std::in_range<int>(*value)) return std::nullopt;
  return static_cast<int>(*value);
}

std::optional<Tag> tagOf(const PropertyList& entry) {
  const PropertyList* value = entry.find("label");
  auto label = value == nullptr ? std::nullopt : value->bytes();
  const auto color = colorOf(entry);
  if (!label || !color) return std::nullopt;
  return Tag{*std::move(label), *color};
}

}  // namespace

Result<Data> encodeTagData(const std::vector<Tag>& tags) {
  PropertyList::Array entries;
  entries.reserve(tags.size());
  for (const Tag& tag : tags) {
    PropertyList::Dictionary entry;
    entry.emplace_back("label", PropertyList::ofBytes(tag.label));
    entry.emplace_back("color", PropertyList(Number::of(std::int64_t{tag.color})));
    entries.emplace_back(std::move(entry));
  }
  return PropertyList(std::move(entries)).encode(tagLimits);
}

std::optional<std::vector<Tag>> decodeTagData(std::span<const std::uint8_t> bytes) {
  const auto list = PropertyList::decode(bytes, tagLimits);
  const auto* entries = list ? list->as<PropertyList::Array>() : nullptr;
  if (entries == nullptr) return std::nullopt;
  std::vector<Tag> tags;
  tags.reserve(entries->size());
  for (const PropertyList& entry : *entries) {
    auto tag = tagOf(entry);
    if (!tag) return std::nullopt;
    tags.push_back(*std::move(tag));
  }
  return tags;
}

}  // namespace mirabel
