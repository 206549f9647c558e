#include "host/SearchableItems.h"

#include <unistd.h>

#include "foundation/Log.h"

namespace mirabel {

Result<SearchIndex*> SearchableItems::index() {
  const std::lock_guard lock(mutex_);
  if (!index_) {
    auto opened = SearchIndex::open(stateFolder_, [](std::string_view text) { logError(text); });
    if (!opened) return fail(opened.error());
    index_ = *std::move(opened);
  }
  return index_.get();
}

Result<void> SearchableItems::deleteDomains(const std::vector<std::string>& domains) {
  const std::string file = stateFolder_ + "/" + std::string(SearchIndex::fileName);
  if (::access(file.c_str(), F_OK) != 0) return {};
  const auto opened = index();
  if (!opened) return fail(opened.error());
  return (*opened)->deleteDomains(domains);
}

void SearchableItems::releaseMemory() {
  const std::lock_guard lock(mutex_);
  if (index_) index_->releaseMemory();
}

}  // namespace mirabel
