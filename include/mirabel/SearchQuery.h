#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "mirabel/Values.h"

namespace mirabel {

/// What to look for. Everything that is given must hold; where nothing is given, nothing is found.
struct SearchQuery {
  /// Each must be part of the name or of a tag, in any case and with any accents. They are text
  /// whatever they hold; those without a character are left out. More than a hundred different
  /// ones, or one that is longer than any name, are found nowhere.
  std::vector<std::string> words{};
  /// Labels that it must have, in any case and with any accents.
  std::vector<std::string> tags{};
  /// A type, or all of a family where it ends in a slash or a slash and an asterisk: "image/*".
  std::optional<std::string> type{};
  /// From this moment on, and before that one.
  std::optional<Date> modifiedSince{};
  std::optional<Date> modifiedBefore{};
  bool includesTrashed = false;
  /// Only what lies in the documents of this application: its bundle identifier. Counts for nothing
  /// where the service answers.
  std::optional<std::string> domain{};
  /// At most so many, the best matches; where the service answers, never more than 10,000.
  std::size_t limit = 100;
};

}  // namespace mirabel
