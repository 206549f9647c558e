// Any bytes, with the digest that belongs to them and without: no position of a listing, or one
// that is the same when it is written and read again.

#include <algorithm>

#include "Require.h"
#include "linux/volume/ListingSlot.h"

using namespace mirabel;

namespace {

void check(std::span<const std::uint8_t> bytes) {
  const auto slot = ListingSlot::decode(bytes);
  if (!slot) return;
  const Data written = slot->encode();
  require(written.size() <= bytes.size());
  require(std::ranges::equal(written, bytes.first(written.size())));
  // Cut short it is none.
  require(!ListingSlot::decode(std::span(written).first(written.size() - 1)));
}

/// The input with the digest that its lengths call for; they are guessed from the input's size.
Data sealed(std::span<const std::uint8_t> bytes) {
  Data copy(bytes.begin(), bytes.end());
  std::ranges::copy(std::string_view("MRBLIST1"), copy.begin());
  const std::uint64_t digest = listingSlotDigest(copy, copy.size());
  for (std::size_t i = 0; i < sizeof(digest); ++i)
    copy[8 + i] = static_cast<std::uint8_t>(digest >> (8 * i));
  return copy;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span bytes(data, size);
  check(bytes);
  if (size >= ListingSlot::headerSize) check(sealed(bytes));
  return 0;
}
