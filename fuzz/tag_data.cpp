// Any bytes: no tag data, or tags that are the same when they are written and read again.

#include "Require.h"
#include "mirabel/TagData.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto tags = decodeTagData({data, size});
  if (!tags) return 0;
  // Objects that the input shared are written apart, and may be too many.
  const auto written = encodeTagData(*tags);
  if (!written) return 0;
  require(decodeTagData(*written) == tags);
  return 0;
}
