#include "host/bus/BusQueries.h"

#include <algorithm>
#include <sdbus-c++/sdbus-c++.h>
#include <utility>

#include "host/bus/BusText.h"

namespace mirabel::bus {
namespace {

std::vector<std::string> allShown(std::vector<std::string> texts) {
  for (std::string& text : texts)
    text = shown(text);
  return texts;
}

std::optional<Date> dateOption(const Options& options, const std::string& key) {
  const auto text = textOption(options, key);
  return text ? Date::fromRFC3339(*text) : std::nullopt;
}

std::optional<std::string> misunderstood(const Options& options) {
  if (auto mistyped = mistypedOption(options, {{"tags", "as"},
                                               {"type", "s"},
                                               {"modifiedSince", "s"},
                                               {"modifiedBefore", "s"},
                                               {"includesTrashed", "b"},
                                               {"limit", "u"}}))
    return mistyped;
  for (const std::string key : {"modifiedSince", "modifiedBefore"}) {
    if (options.contains(key) && !dateOption(options, key))
      return key + " is no date in RFC 3339 form";
  }
  return {};
}

}  // namespace

std::uint32_t limited(std::size_t limit) {
  return static_cast<std::uint32_t>(std::min<std::size_t>(limit, UINT32_MAX));
}

std::vector<std::string> wordsFor(const SearchQuery& query) {
  return allShown(query.words);
}

Options optionsFor(const SearchQuery& query) {
  Options options;
  if (!query.tags.empty()) options["tags"] = sdbus::Variant(allShown(query.tags));
  if (query.type) options["type"] = sdbus::Variant(shown(*query.type));
  if (query.modifiedSince) {
    options["modifiedSince"] = sdbus::Variant(query.modifiedSince->rfc3339());
  }
  if (query.modifiedBefore) {
    options["modifiedBefore"] = sdbus::Variant(query.modifiedBefore->rfc3339());
  }
  options["includesTrashed"] = sdbus::Variant(query.includesTrashed);
  options["limit"] = sdbus::Variant(limited(query.limit));
  return options;
}

std::expected<SearchQuery, std::string> queryFrom(std::vector<std::string> words,
                                                  const Options& options) {
  if (auto what = misunderstood(options)) return std::unexpected(*std::move(what));
  SearchQuery query;
  query.words = std::move(words);
  if (const auto tags = options.find("tags"); tags != options.end())
    query.tags = tags->second.get<std::vector<std::string>>();
  query.type = textOption(options, "type");
  query.modifiedSince = dateOption(options, "modifiedSince");
  query.modifiedBefore = dateOption(options, "modifiedBefore");
  if (const auto trashed = options.find("includesTrashed"); trashed != options.end())
    query.includesTrashed = trashed->second.get<bool>();
  if (const auto limit = options.find("limit"); limit != options.end())
    query.limit = std::min(limit->second.get<std::uint32_t>(), mostFound);
  return query;
}

std::optional<Number> numberFrom(const sdbus::Variant& variant) {
  if (variant.containsValueOfType<std::int64_t>()) return Number::of(variant.get<std::int64_t>());
  if (variant.containsValueOfType<std::uint64_t>()) return Number::of(variant.get<std::uint64_t>());
  if (variant.containsValueOfType<double>()) return Number::of(variant.get<double>());
  if (variant.containsValueOfType<std::int32_t>())
    return Number::of(std::int64_t{variant.get<std::int32_t>()});
  if (variant.containsValueOfType<std::uint32_t>())
    return Number::of(std::int64_t{variant.get<std::uint32_t>()});
  return {};
}

}  // namespace mirabel::bus
