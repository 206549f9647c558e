#include "host/search/SearchLoad.h"

#include <functional>
#include <utility>

#include "host/search/SearchRow.h"
#include "host/search/SearchSchema.h"
#include "items/LocalItem.h"

namespace mirabel {

Result<std::unique_ptr<SearchLoad>> SearchLoad::begin(const SearchFiles& files) {
  if (auto made = files.makeNew(); !made) return fail(made.error());
  std::unique_ptr<SearchLoad> load(new SearchLoad(files));
  auto store = SearchStore::beginFilling(files.newPath());
  if (!store) return fail(store.error());
  load->store_ = *std::move(store);
  return load;
}

SearchLoad::~SearchLoad() {
  queue_.sync([this] {
    store_.reset();
    if (!isFinished_) files_.removeNew();
  });
}

Result<void> SearchLoad::outcome() {
  const std::lock_guard lock(mutex_);
  return outcome_;
}

// Nothing is done after an error: half of a page must not be taken for the whole.
void SearchLoad::run(const std::function<Result<void>()>& work) {
  if (!store_ || !outcome()) return;
  auto done = work();
  if (done) return;
  const std::lock_guard lock(mutex_);
  outcome_ = std::move(done);
}

Result<void> SearchLoad::add(VesselItems items) {
  if (auto sofar = outcome(); !sofar) return sofar;
  pages_.acquire();
  queue_.async([this, items = std::move(items)] {
    run([&] { return write(items); });
    pages_.release();
  });
  return {};
}

Result<void> SearchLoad::write(const VesselItems& items) {
  for (const auto& item : items) {
    const SearchRow row = searchRowOf(*item);
    const bool isNew = hashes_.insert(std::hash<std::string>()(row.identifier)).second;
    // It has to be looked up, and so may others: what was moved is told once more.
    if (!isNew) {
      if (auto made = makeSearchIndexes(store_->database()); !made) return made;
    }
    auto added = isNew ? store_->add(row) : store_->put(row);
    if (!added) return added;
  }
  return store_->writeWords();
}

void SearchLoad::removeDomains(const std::vector<std::string>& domains) {
  queue_.sync([&] {
    run([&]() -> Result<void> {
      for (const std::string& domain : domains)
        if (auto removed = store_->removeDomain(domain); !removed) return removed;
      return store_->writeWords();
    });
  });
}

Result<void> SearchLoad::finish(const Data& anchor) {
  queue_.sync([&] {
    run([&] { return SearchStore::finishFilling(std::move(store_), anchor); });
    isFinished_ = outcome().has_value();
  });
  return outcome();
}

}  // namespace mirabel
