// Any bytes: no position of a walk, or one that is the same when it is written and read again.

#include "Require.h"
#include "fs/WalkPosition.h"

using namespace mirabel;

namespace {

// So many are read again in any case.
constexpr std::size_t mostFolders = 1'000;

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto position = WalkPosition::decode({data, size});
  if (!position) return 0;
  const auto again = WalkPosition::decode(position->encode());
  // Written anew it may outgrow its limit: references that the input shared are written apart.
  require(!again || *again == *position);
  require(again || position->folders.size() > mostFolders);
  return 0;
}
