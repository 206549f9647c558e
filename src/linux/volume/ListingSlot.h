#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "mirabel/Values.h"

namespace mirabel {

/// One position in the file of listing positions; see docs/formats/listing-positions.md.
struct ListingSlot {
  static constexpr std::size_t headerSize = 36;

  std::uint64_t number = 0;  ///< counts what was kept, from 1; 0: the slot is free
  std::string container;
  Data cursor;
  Data position;

  /// As long as the header and the three.
  [[nodiscard]] Data encode() const;
  /// Nothing for bytes that do not begin with what `encode` wrote, whole.
  [[nodiscard]] static std::optional<ListingSlot> decode(std::span<const std::uint8_t> bytes);

  friend bool operator==(const ListingSlot&, const ListingSlot&) = default;
};

/// The digest that the first `size` bytes of a slot are to carry in bytes 8 to 15. At least
/// `ListingSlot::headerSize` of them, and no more than there are.
[[nodiscard]] std::uint64_t listingSlotDigest(std::span<const std::uint8_t> bytes,
                                              std::size_t size);

}  // namespace mirabel
