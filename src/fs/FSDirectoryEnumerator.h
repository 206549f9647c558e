#pragma once

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <optional>
#include <vector>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "platform/DirectoryStreams.h"

namespace mirabel {

/// Which entries a walk leaves out: a set of bits.
struct EnumeratorOptions {
  std::int64_t rawValue = 0;

  static const EnumeratorOptions skipsHiddenFiles;              // 1
  static const EnumeratorOptions skipsPackageDescendants;       // 2
  static const EnumeratorOptions skipsSubdirectoryDescendants;  // 4

  constexpr EnumeratorOptions() = default;
  constexpr explicit EnumeratorOptions(std::int64_t raw) : rawValue(raw) {}
  constexpr EnumeratorOptions(std::initializer_list<EnumeratorOptions> options) {
    for (const EnumeratorOptions& option : options)
      rawValue |= option.rawValue;
  }

  [[nodiscard]] constexpr bool contains(EnumeratorOptions o) const {
    return (rawValue & o.rawValue) == o.rawValue;
  }
  [[nodiscard]] constexpr bool isEmpty() const { return rawValue == 0; }
  [[nodiscard]] constexpr EnumeratorOptions unionWith(EnumeratorOptions o) const {
    return EnumeratorOptions(rawValue | o.rawValue);
  }
  [[nodiscard]] constexpr EnumeratorOptions intersection(EnumeratorOptions o) const {
    return EnumeratorOptions(rawValue & o.rawValue);
  }
  [[nodiscard]] constexpr EnumeratorOptions symmetricDifference(EnumeratorOptions o) const {
    return EnumeratorOptions(rawValue ^ o.rawValue);
  }
  [[nodiscard]] constexpr EnumeratorOptions subtracting(EnumeratorOptions o) const {
    return EnumeratorOptions(rawValue & ~o.rawValue);
  }
  friend constexpr bool operator==(EnumeratorOptions, EnumeratorOptions) = default;
};

inline constexpr EnumeratorOptions EnumeratorOptions::skipsHiddenFiles{1};
inline constexpr EnumeratorOptions EnumeratorOptions::skipsPackageDescendants{2};
inline constexpr EnumeratorOptions EnumeratorOptions::skipsSubdirectoryDescendants{4};

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

  using Visitor = std::function<Result<void>(const URL&)>;

  /// Walks and answers how many entries were counted, passed over or visited. A failing visitor
  /// ends the walk with its error; a directory that cannot be opened or closed ends it with a
  /// POSIX error, logged at debug level. The walk's memory grows with the depth only.
  [[nodiscard]] Result<std::uint64_t> enumerate(DirectoryStreams& directories,
                                                ResourceValueSource& resources,
                                                const Visitor& visitor) const;
};

}  // namespace mirabel
