#pragma once

#include <cstdint>
#include <expected>
#include <string>
#include <vector>

#include "host/bus/BusOptions.h"
#include "mirabel/SearchQuery.h"

namespace mirabel::bus {

// A search as it goes over the bus: the words as, the rest as a{sv}. What is no text for the bus is
// sent as it is shown, for it is looked for like this anyway. The domain is no caller's to choose.

[[nodiscard]] std::vector<std::string> wordsFor(const SearchQuery& query);
[[nodiscard]] Options optionsFor(const SearchQuery& query);

/// A limit as it goes over the bus.
[[nodiscard]] std::uint32_t limited(std::size_t limit);

/// At most so many are found, whatever the limit that is asked for.
inline constexpr std::uint32_t mostFound = 10'000;
/// The way back; or what of the options is wanted and can't be understood, for the caller.
[[nodiscard]] std::expected<SearchQuery, std::string> queryFrom(std::vector<std::string> words,
                                                                const Options& options);

/// A number of any of the types x, t, d, i and u.
[[nodiscard]] std::optional<Number> numberFrom(const sdbus::Variant& variant);

}  // namespace mirabel::bus
