#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "host/search/SearchIndex.h"
#include "mirabel/Error.h"

namespace mirabel {

/// The search index of a home, opened when it is first needed. Whoever owns it holds the volume's
/// state. Any thread may call it.
class SearchableItems {
 public:
  /// `stateFolder`: the volume's.
  explicit SearchableItems(std::string stateFolder) : stateFolder_(std::move(stateFolder)) {}

  /// Errors: those of `SearchIndex::open`. It lives as long as this.
  [[nodiscard]] Result<SearchIndex*> index();
  /// Takes out what belongs to these applications. Where there is no index yet, none is made.
  [[nodiscard]] Result<void> deleteDomains(const std::vector<std::string>& domains);
  /// Gives back what is kept in memory to answer sooner.
  void releaseMemory();

 private:
  std::string stateFolder_;
  std::mutex mutex_;
  std::unique_ptr<SearchIndex> index_;
};

}  // namespace mirabel
