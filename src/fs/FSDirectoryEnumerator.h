#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <vector>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "fs/EnumeratorOptions.h"
#include "fs/FSDirectoryWalk.h"
#include "platform/DirectoryStreams.h"

namespace mirabel {

/// Walks the entries of directories in the file system's order, a directory before its contents,
/// and hands each entry's URL to a visitor. Entries are counted in one flat sequence over the
/// whole walk; `offset` and `limit` cut a page out of it. A value without state between walks.
struct FSDirectoryEnumerator {
  std::vector<URL> urls;  ///< the directories to walk, in order
  bool recursively = false;
  std::uint64_t offset = 0;  ///< entries to pass over before the visitor is first called
  std::uint64_t limit = 0;   ///< most entries handed to the visitor; 0 opens nothing at all
  /// Asked once per directory; absent, or answering nothing, means the default: hidden names
  /// left out, packages not entered, and folders entered only when `recursively`.
  std::function<std::optional<EnumeratorOptions>(const URL&)> directoryEnumerationOptionsFor;

  using Visitor = FSDirectoryWalk::Visitor;

  /// Walks and answers how many entries were counted, passed over or visited. A failing visitor
  /// ends the walk with its error; a directory that cannot be opened or closed ends it with a
  /// POSIX error, logged at debug level. The walk's memory grows with the depth only.
  [[nodiscard]] Result<std::uint64_t> enumerate(DirectoryStreams& directories,
                                                ResourceValueSource& resources,
                                                const Visitor& visitor) const;
};

}  // namespace mirabel
