#include "linux/volume/ListingSlot.h"

#include <algorithm>
#include <string_view>

namespace mirabel {
namespace {

constexpr std::string_view magic = "MRBLIST1";
constexpr std::size_t digestOffset = 8;
constexpr std::size_t numberOffset = 16;
constexpr std::size_t lengthsOffset = 24;

template <class Integer>
void put(Data& bytes, std::size_t offset, Integer value) {
  for (std::size_t i = 0; i < sizeof(Integer); ++i)
    bytes[offset + i] = static_cast<std::uint8_t>(value >> (8 * i));
}

template <class Integer>
Integer get(std::span<const std::uint8_t> bytes, std::size_t offset) {
  Integer value = 0;
  for (std::size_t i = 0; i < sizeof(Integer); ++i)
    value = static_cast<Integer>(value | (Integer{bytes[offset + i]} << (8 * i)));
  return value;
}

Data dataOf(std::span<const std::uint8_t> bytes) {
  return {bytes.begin(), bytes.end()};
}

}  // namespace

// FNV-1a: finds out accidents, not attackers.
std::uint64_t listingSlotDigest(std::span<const std::uint8_t> bytes, std::size_t size) {
  std::uint64_t digest = 0xCBF29CE484222325;
  for (std::size_t i = numberOffset; i < size; ++i)
    digest = (digest ^ bytes[i]) * 0x100000001B3;
  return digest;
}

Data ListingSlot::encode() const {
  Data bytes(headerSize);
  std::ranges::copy(magic, bytes.begin());
  put(bytes, numberOffset, number);
  put(bytes, lengthsOffset, static_cast<std::uint32_t>(container.size()));
  put(bytes, lengthsOffset + 4, static_cast<std::uint32_t>(cursor.size()));
  put(bytes, lengthsOffset + 8, static_cast<std::uint32_t>(position.size()));
  bytes.insert(bytes.end(), container.begin(), container.end());
  bytes.insert(bytes.end(), cursor.begin(), cursor.end());
  bytes.insert(bytes.end(), position.begin(), position.end());
  put(bytes, digestOffset, listingSlotDigest(bytes, bytes.size()));
  return bytes;
}

std::optional<ListingSlot> ListingSlot::decode(std::span<const std::uint8_t> bytes) {
  if (bytes.size() < headerSize || !std::ranges::equal(bytes.first(magic.size()), magic)) return {};
  const std::size_t container = get<std::uint32_t>(bytes, lengthsOffset);
  const std::size_t cursor = get<std::uint32_t>(bytes, lengthsOffset + 4);
  const std::size_t position = get<std::uint32_t>(bytes, lengthsOffset + 8);
  const std::size_t size = headerSize + container + cursor + position;
  if (size > bytes.size() ||
      get<std::uint64_t>(bytes, digestOffset) != listingSlotDigest(bytes, size)) {
    return {};
  }
  const auto name = bytes.subspan(headerSize, container);
  return ListingSlot{get<std::uint64_t>(bytes, numberOffset), std::string(name.begin(), name.end()),
                     dataOf(bytes.subspan(headerSize + container, cursor)),
                     dataOf(bytes.subspan(headerSize + container + cursor, position))};
}

}  // namespace mirabel
