// A byte that says which number a name is to get, and any bytes as the name: another name is made
// of one that can be had, and can be had too.

#include "ByteSource.h"
#include "Require.h"
#include "foundation/Unicode.h"
#include "linux/operations/ItemNames.h"

using namespace mirabel;

namespace {

void check(std::string_view name, std::uint64_t number, NameOf kind) {
  const NameParts parts = partsOf(name, kind);
  require(std::string(parts.stem) + std::string(parts.extension) == name);
  require(!parts.stem.empty() || name.empty());
  if (whyNoName(name)) return;
  const std::string made = numberedName(name, number, kind);
  require(!whyNoName(made));
  require(made.ends_with(" " + std::to_string(number) + std::string(parts.extension)));
  require(isUTF8(made) || !isUTF8(name));
  // No two numbers make one name.
  require(numberedName(name, number + 1, kind) != made);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  ByteSource source(data, size);
  const std::uint64_t number = (std::uint64_t{1} << source.below(63)) + 1;
  const std::string_view name = source.rest();
  check(name, number, NameOf::file);
  check(name, number, NameOf::plainFolder);
  return 0;
}
