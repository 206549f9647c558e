#pragma once

#include <algorithm>
#include <optional>
#include <string_view>
#include <vector>

#include "mirabel/Values.h"

namespace mirabel {

/// How `binaryList` lays out a list, and in what it lies about it.
struct ListShape {
  std::uint8_t offsetSize = 1;
  std::uint8_t referenceSize = 1;
  std::uint64_t top = 0;
  std::optional<std::uint8_t> claimedOffsetSize = {};
  std::optional<std::uint64_t> claimedCount = {};
  std::optional<std::uint64_t> claimedTableStart = {};
  std::optional<std::uint64_t> movedOffset = {};  ///< of the last object
  std::string_view header = "bplist00";
};

/// A binary property list of objects that are given as their bytes.
inline Data binaryList(const std::vector<Data>& objects, const ListShape& shape = {}) {
  Data list = dataFromString(shape.header);
  const auto append = [&list](std::uint64_t value, int size) {
    while (size-- > 0) {
      list.push_back(size < 8 ? static_cast<std::uint8_t>(value >> (8 * size)) : std::uint8_t{0});
    }
  };
  std::vector<std::uint64_t> offsets;
  for (const Data& object : objects) {
    offsets.push_back(list.size());
    std::ranges::copy(object, std::back_inserter(list));
  }
  if (shape.movedOffset) offsets.back() = *shape.movedOffset;
  const std::uint64_t tableStart = list.size();
  for (const std::uint64_t offset : offsets) {
    append(offset, shape.offsetSize);
  }
  append(0, 6);
  append(shape.claimedOffsetSize.value_or(shape.offsetSize), 1);
  append(shape.referenceSize, 1);
  append(shape.claimedCount.value_or(objects.size()), 8);
  append(shape.top, 8);
  append(shape.claimedTableStart.value_or(tableStart), 8);
  return list;
}

}  // namespace mirabel
