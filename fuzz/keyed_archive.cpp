// Any bytes: at most one of the classes reads them, and what it reads can be archived again.

#include "Require.h"
#include "foundation/KeyedArchive.h"

using namespace mirabel;

namespace {

template <class Unarchive, class Archive>
int check(std::span<const std::uint8_t> bytes, Unarchive unarchive, Archive archive) {
  const auto value = unarchive(bytes);
  if (!value) return 0;
  // Written anew it may outgrow its limit: references that the input shared are written apart.
  const auto written = archive(*value);
  if (!written) return 1;
  const auto again = unarchive(*written);
  require(again.has_value());
  require(*again == *value);
  return 1;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace keyedarchive;
  const std::span bytes(data, size);
  const int classes = check(bytes, unarchiveDate, archiveDate) +
                      check(bytes, unarchiveNumber, archiveNumber) +
                      check(bytes, unarchiveString, archiveString) +
                      check(bytes, unarchiveStrings, archiveStrings) +
                      check(bytes, unarchiveDictionary, archiveDictionary);
  require(classes <= 1);
  return 0;
}
