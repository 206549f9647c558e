#include "fs/FSDirectoryEnumerator.h"

#include "foundation/FatalError.h"

namespace mirabel {

Result<std::uint64_t> FSDirectoryEnumerator::enumerate(DirectoryStreams& directories,
                                                       ResourceValueSource& resources,
                                                       const Visitor& visitor) const {
  if (limit == 0) return 0;
  FSDirectoryWalk walk({urls, recursively, directoryEnumerationOptionsFor}, directories, resources);
  const auto passedOver = walk.next(offset, [](const URL&) { return Result<void>{}; });
  if (!passedOver) return passedOver;
  const auto visited = walk.next(limit, visitor);
  if (!visited) return visited;
  const std::uint64_t count = *passedOver + *visited;
  if (count < *passedOver) {
    fatalError("a directory walk counted more entries than there are numbers");
  }
  if (*visited < limit) return count;
  if (auto finished = walk.finish(); !finished) return fail(finished.error());
  return count;
}

}  // namespace mirabel
