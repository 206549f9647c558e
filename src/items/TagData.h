#pragma once

#include <optional>
#include <span>
#include <string>
#include <vector>

#include "foundation/Error.h"
#include "foundation/Values.h"

namespace mirabel {

/// A label that the user put on an item.
struct Tag {
  std::string label;
  int color = 0;  ///< 0: none

  friend bool operator==(const Tag&, const Tag&) = default;
};

/// The host's encoding of a list of tags: a binary property list, an array of dictionaries with
/// the keys "label" and "color".
[[nodiscard]] Result<Data> encodeTagData(const std::vector<Tag>& tags);
/// Nothing for bytes that are no tag data.
[[nodiscard]] std::optional<std::vector<Tag>> decodeTagData(std::span<const std::uint8_t> bytes);

}  // namespace mirabel
