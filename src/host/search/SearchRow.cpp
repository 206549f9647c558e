#include "host/search/SearchRow.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <limits>

#include "host/search/SearchText.h"
#include "mirabel/TagData.h"

namespace mirabel {
namespace {

constexpr std::int64_t second = 1'000'000'000;

/// The order of doubles, as whole numbers: those below zero count downwards in their bits.
std::int64_t orderOf(double number) {
  if (std::isnan(number)) return std::numeric_limits<std::int64_t>::max();
  const auto bits = std::bit_cast<std::int64_t>(number == 0 ? 0.0 : number);
  return bits >= 0 ? bits : std::numeric_limits<std::int64_t>::min() - bits;
}

std::string tagsOf(const LocalItem& item) {
  std::string tags;
  if (!item.tagData()) return tags;
  const auto labels = decodeTagData(*item.tagData());
  if (!labels) return tags;
  for (const Tag& tag : *labels) {
    const std::string text = searchTag(tag.label);
    if (tags.size() + text.size() > longestSearchText) break;
    tags += tags.empty() ? text : text.substr(1);  // neighbours share a newline
  }
  return tags;
}

std::optional<std::int64_t> timeOf(const std::optional<Date>& date) {
  return date ? std::optional(searchTime(*date)) : std::nullopt;
}

}  // namespace

SearchRow searchRowOf(const LocalItem& item) {
  SearchRow row;
  row.identifier = item.itemIdentifier();
  row.name = foldedText(item.filename());
  row.tags = tagsOf(item);
  row.type = item.typeIdentifier();
  row.modified = timeOf(item.contentModificationDate());
  row.recency = std::max(row.modified, timeOf(item.lastUsedDate()));
  if (item.favoriteRank()) row.favoriteOrder = orderOf(item.favoriteRank()->asDouble());
  row.domain = item.vs_beaconDomainIdentifier().value_or("");
  row.isFolder = item.vs_isContainer();
  row.isTrashed = item.isTrashed();
  return row;
}

std::int64_t searchTime(const Date& date) {
  constexpr std::int64_t latest = std::numeric_limits<std::int64_t>::max() / second - 1;
  if (date.seconds > latest) return std::numeric_limits<std::int64_t>::max();
  if (date.seconds < -latest) return std::numeric_limits<std::int64_t>::min();
  return date.seconds * second + date.nanoseconds;
}

std::string searchTag(std::string_view label) {
  return "\n" + trimmedFoldedText(label) + "\n";
}

}  // namespace mirabel
