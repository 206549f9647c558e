#pragma once

#include <optional>
#include <span>
#include <string>
#include <vector>

#include "mirabel/Error.h"
#include "mirabel/Export.h"
#include "mirabel/Values.h"

namespace mirabel {

/// A label that the user put on an item.
struct Tag {
  std::string label;
  int color = 0;  ///< 0: none. Not kept: the tags of an item all have none

  friend bool operator==(const Tag&, const Tag&) = default;
};

/// The host's encoding of a list of tags: a binary property list, an array of dictionaries with
/// the keys "label" and "color". Error: `ErrorDomain::propertyList` for more than 65,536 objects or
/// 1 MiB.
[[nodiscard]] MIRABEL_EXPORT Result<Data> encodeTagData(const std::vector<Tag>& tags);
/// Nothing for bytes that are no tag data.
[[nodiscard]] MIRABEL_EXPORT std::optional<std::vector<Tag>> decodeTagData(
    std::span<const std::uint8_t> bytes);

}  // namespace mirabel
