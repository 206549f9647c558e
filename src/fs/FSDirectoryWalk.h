#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "foundation/ResourceValues.h"
#include "foundation/URL.h"
#include "fs/EnumeratorOptions.h"
#include "fs/WalkPosition.h"
#include "platform/DirectoryStreams.h"

namespace mirabel {

/// A walk through directories that can be stopped after any entry and goes on from there: the
/// directories from the outermost to the one being read stay open. Entries come in the file
/// system's order, a directory before its contents. Memory and descriptors grow with the depth
/// only. Used by one thread at a time; after a failure it is of no more use.
class FSDirectoryWalk {
 public:
  using Visitor = std::function<Result<void>(const URL&)>;

  struct Plan {
    std::vector<URL> urls;  ///< the directories to walk, in order
    bool recursively = false;
    /// See `FSDirectoryEnumerator`.
    std::function<std::optional<EnumeratorOptions>(const URL&)> directoryEnumerationOptionsFor{};
    /// Asked when a directory cannot be opened, or not be looked at to see whether it is to be:
    /// true leaves its contents out, false ends the walk with the error. Without a function the
    /// former ends the walk and the latter does not.
    std::function<bool(const URL&, const Error&)> leavesOut{};
  };

  /// What is passed by reference outlives the walk.
  FSDirectoryWalk(Plan plan, DirectoryStreams& directories, ResourceValueSource& resources);

  /// Hands up to `limit` further entries to the visitor and answers how many there were: fewer
  /// than `limit` means that nothing is left. Does not read past the last one. Errors: the
  /// visitor's, and POSIX errors, logged at debug level, of a directory that cannot be opened or
  /// closed.
  [[nodiscard]] Result<std::uint64_t> next(std::uint64_t limit, const Visitor& visitor);

  /// Ends the walk as one whose page is full: each open directory is read on to see whether it
  /// has more, and closed; where the outermost had none, the next one gets its turn to be opened.
  [[nodiscard]] Result<void> finish();

  /// Notes which objects stand open, for a walk that is put aside after `next`.
  void pause();
  /// Forgets what was cached of the directories that stand open, for their resource caches are
  /// snapshots. False when one of them no longer lies where it lay at `pause`: entries would be
  /// looked for in the wrong place.
  [[nodiscard]] bool resume();

  /// Where a paused walk stands; nothing where a directory can't tell, or was not there to be
  /// noted.
  [[nodiscard]] std::optional<WalkPosition> position();
  /// Takes up, with a walk that was not begun yet, where one of the same plan stood. False when a
  /// directory no longer lies where it lay then; the walk is of no more use. POSIX errors of a
  /// directory that is there and can't be opened.
  [[nodiscard]] Result<bool> restore(const WalkPosition& position);

  [[nodiscard]] std::size_t openDirectories() const { return levels_.size(); }

 private:
  struct Level {
    URL url;
    std::unique_ptr<DirectoryStream> stream;
    EnumeratorOptions options;
    std::optional<ResourceValue> fileID{};
  };
  struct Descent {
    URL url;
    EnumeratorOptions options;  ///< of the directory that holds it
  };

  [[nodiscard]] Result<std::optional<URL>> nextEntry();
  [[nodiscard]] std::optional<DirectoryEntry> readVisible();
  [[nodiscard]] Result<void> enter(const URL& directory);
  [[nodiscard]] Result<void> leave();
  [[nodiscard]] EnumeratorOptions optionsFor(const URL& directory) const;
  [[nodiscard]] Result<void> descend(const Descent& descent);
  [[nodiscard]] std::optional<ResourceValue> fileIDAt(const URL& directory) const;
  [[nodiscard]] std::uint64_t planDigest() const;
  [[nodiscard]] Result<bool> restoreLevel(const WalkPosition::Folder& folder, URL url);

  Plan plan_;
  DirectoryStreams& directories_;
  ResourceReader reader_;
  std::size_t nextRoot_ = 0;
  std::vector<Level> levels_;
  /// The entry handed out last, when it may have to be entered. Not before the next step: what is
  /// wrong in there is not the concern of a page that ends with it.
  std::optional<Descent> descent_;
};

}  // namespace mirabel
