#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <unordered_set>
#include <vector>

#include "foundation/Error.h"
#include "foundation/Values.h"
#include "host/search/SearchFiles.h"
#include "linux/volume/Database.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// An index that is made from nothing, in a file of its own, which goes away with this unless it
/// was finished. Any thread may call it.
class SearchLoad {
 public:
  /// `files` outlives it.
  [[nodiscard]] static Result<std::unique_ptr<SearchLoad>> begin(const SearchFiles& files);
  ~SearchLoad();
  SearchLoad(const SearchLoad&) = delete;
  SearchLoad& operator=(const SearchLoad&) = delete;

  /// What is added again stands for what was.
  [[nodiscard]] Result<void> add(const VesselItems& items);
  [[nodiscard]] Result<void> removeDomains(const std::vector<std::string>& domains);
  /// Fills the tables and closes the file, which can take the place of the former index then.
  /// Nothing else may follow.
  [[nodiscard]] Result<void> finish(const Data& anchor);

 private:
  struct Statements;
  explicit SearchLoad(const SearchFiles& files);
  [[nodiscard]] Result<void> prepare();
  [[nodiscard]] Result<void> moveRows();
  [[nodiscard]] Result<void> addWords();
  [[nodiscard]] Result<void> close(const Data& anchor);

  const SearchFiles& files_;
  std::mutex mutex_;
  /// With mutex_; null once it is finished.
  std::unique_ptr<Database> database_;
  std::unique_ptr<Statements> statements_;
  /// Of the identifiers that were added: a listing hardly ever tells one twice.
  std::unordered_set<std::size_t> hashes_;
};

}  // namespace mirabel
