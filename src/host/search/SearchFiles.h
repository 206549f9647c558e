#pragma once

#include <cstdint>
#include <string>

#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {

/// The files of the search index in the folder of a volume's state, looked at without SQLite:
/// "search.db" with its log, and "search.db.new" while an index is made from nothing. All are for
/// their owner only. POSIX errors.
class SearchFiles {
 public:
  /// Removes what a process that was killed has left behind.
  [[nodiscard]] static Result<SearchFiles> open(const std::string& folder);

  [[nodiscard]] std::string path() const { return folder_ + "/search.db"; }
  [[nodiscard]] std::string newPath() const { return path() + ".new"; }

  /// Makes an empty file where there is none.
  [[nodiscard]] Result<void> make() const;
  [[nodiscard]] Result<void> makeNew() const;
  void remove() const;
  void removeNew() const;
  [[nodiscard]] Result<void> synchronizeNew() const;
  /// Has the new index, which is on disk, is closed and has no log, take the place of the former,
  /// which is closed too. When this is cut short, there is the former or the new one; none where
  /// the former was damaged.
  [[nodiscard]] Result<void> replaceByNew() const;

 private:
  SearchFiles(std::string folder, UniqueFd descriptor)
      : folder_(std::move(folder)), descriptor_(std::move(descriptor)) {}
  [[nodiscard]] Result<void> make(const char* name) const;
  [[nodiscard]] Result<void> synchronize() const;
  /// In bytes; -1 where there is none.
  [[nodiscard]] std::int64_t sizeOf(const char* name) const;

  std::string folder_;
  UniqueFd descriptor_;
};

}  // namespace mirabel
