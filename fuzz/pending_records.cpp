// Any bytes as the list in the file of pending work, which has a digest before it: no records, or
// those that are the same when they are written and read again.

#include <string_view>

#include "Require.h"
#include "linux/operations/PendingRecords.h"
#include "linux/volume/Digest.h"

using namespace mirabel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span list(data, size);
  Data file = dataFromString("MRBPEND2");
  for (std::uint64_t digest = digestOf(list), i = 0; i < sizeof digest; ++i)
    file.push_back(static_cast<std::uint8_t>(digest >> (8 * i)));
  file.insert(file.end(), list.begin(), list.end());
  const auto records = PendingRecords::decode(file);
  // Without the digest of exactly these bytes there are none.
  file.back() ^= 1;
  require(!PendingRecords::decode(file));
  if (!records) return 0;
  const auto written = records->encode();
  if (!written) return 0;  // what shared objects in the input is written apart
  require(PendingRecords::decode(*written) == records);
  return 0;
}
