// Any bytes: refused, or a value that is the same after it was written and read again.

#include "Require.h"
#include "foundation/PropertyList.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  // Small, so that the time goes into many inputs and not into a few that unfold.
  constexpr PropertyList::Limits limits{.depth = 64, .objects = 10'000, .bytes = 1u << 20};
  const auto value = PropertyList::decode({data, size}, limits);
  if (!value) return 0;
  const auto written = value->encode(limits);
  require(written.has_value());
  const auto again = PropertyList::decode(*written, limits);
  require(again.has_value());
  require(*again == *value);
  return 0;
}
