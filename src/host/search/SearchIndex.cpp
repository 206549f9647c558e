#include "host/search/SearchIndex.h"

#include <cerrno>
#include <utility>

#include "foundation/Log.h"
#include "host/search/SearchLoad.h"
#include "host/search/SearchRow.h"
#include "host/search/SearchRun.h"
#include "host/search/SearchSchema.h"
#include "host/search/SearchStore.h"
#include "items/LocalItem.h"

namespace mirabel {
namespace {

// 4 MiB: writing them into the database takes a few milliseconds.
constexpr int longestLog = 1000;

Result<void> applyTo(SearchStore& store, const std::vector<SearchRow>& updated,
                     const std::vector<std::string>& deletedIdentifiers, const Data& anchor) {
  for (const std::string& identifier : deletedIdentifiers)
    if (auto removed = store.remove(identifier); !removed) return removed;
  for (const SearchRow& row : updated)
    if (auto put = store.put(row); !put) return put;
  return store.setAnchor(anchor);
}

}  // namespace

SearchIndex::SearchIndex(SearchFiles files) : files_(std::move(files)) {}

SearchIndex::~SearchIndex() {
  close();
}

Result<std::unique_ptr<SearchIndex>> SearchIndex::open(const std::string& folder,
                                                       const Notice& notice) {
  auto files = SearchFiles::open(folder);
  if (!files) return fail(files.error());
  std::unique_ptr<SearchIndex> index(new SearchIndex(*std::move(files)));
  auto opened = index->openStore();
  if (!opened && isDamagedIndex(opened.error())) {
    const std::string text =
        "the search index can't be used and is made anew; " + opened.error().description();
    logInfo(text);
    if (notice) notice(text);
    opened = index->makeAnew();
  }
  if (!opened) return fail(opened.error());
  return index;
}

Result<void> SearchIndex::openStore() {
  if (store_) return {};
  if (auto made = files_.make(); !made) return made;
  auto store = SearchStore::open(files_.path());
  if (!store) return fail(store.error());
  auto run = SearchRun::create(**store);
  if (!run) return fail(run.error());
  store_ = *std::move(store);
  run_ = *std::move(run);
  return {};
}

Result<void> SearchIndex::makeAnew() {
  close();
  files_.remove();
  return openStore();
}

void SearchIndex::close() {
  run_.reset();
  store_.reset();
}

/// Damage ends the database, so that the next feed begins from nothing. Other errors leave it as it
/// is.
void SearchIndex::recoverFrom(const Error& error) {
  if (!isDamagedIndex(error)) return;
  logError("the search index is damaged and made anew; " + error.description());
  if (auto made = makeAnew(); !made) {
    logError("can't make the search index; " + made.error().description());
  }
}

template <class T>
Result<T> SearchIndex::read(const std::function<Result<T>()>& work) {
  const std::lock_guard lock(mutex_);
  if (auto opened = openStore(); !opened) return fail(opened.error());
  auto answer = work();
  if (!answer) recoverFrom(answer.error());
  return answer;
}

/// The caller holds writing_.
Result<void> SearchIndex::write(const std::function<Result<void>()>& work) {
  return read<void>([&]() -> Result<void> {
    if (auto written = store_->transaction(work); !written) return written;
    Database& database = store_->database();
    if (database.logPages() < longestLog) return {};
    // It is written, whether the log can be moved now or not.
    if (auto moved = database.checkpoint(Database::Log::kept); !moved) {
      logDebug([&] { return "can't fold the search index's log; " + moved.error().description(); });
    }
    return {};
  });
}

std::optional<Data> SearchIndex::anchor() {
  const auto anchor = read<std::optional<Data>>([this] { return store_->anchor(); });
  return anchor ? *anchor : std::nullopt;
}

Result<std::uint64_t> SearchIndex::count() {
  return read<std::uint64_t>([this] { return store_->count(); });
}

Result<void> SearchIndex::apply(const VesselItems& updated,
                                const std::vector<std::string>& deletedIdentifiers,
                                const Data& anchor) {
  std::vector<SearchRow> rows;
  rows.reserve(updated.size());
  for (const auto& item : updated)
    rows.push_back(searchRowOf(*item));
  const std::lock_guard lock(writing_);
  return write([&] { return applyTo(*store_, rows, deletedIdentifiers, anchor); });
}

Result<void> SearchIndex::deleteDomains(const std::vector<std::string>& domains) {
  const std::lock_guard lock(writing_);
  if (const auto load = load_.lock()) load->removeDomains(domains);
  auto deleted = write([&]() -> Result<void> {
    for (const std::string& domain : domains)
      if (auto removed = store_->removeDomain(domain); !removed) return removed;
    return {};
  });
  // Nothing is left of a database that was damaged.
  if (!deleted && isDamagedIndex(deleted.error())) return {};
  return deleted;
}

// Starting over -----------------------------------------------------------------------------------

SearchIndex::StartingOver::StartingOver(SearchIndex& index, std::shared_ptr<SearchLoad> load)
    : index_(index), load_(std::move(load)) {}

SearchIndex::StartingOver::~StartingOver() {
  const std::lock_guard lock(index_.writing_);
  load_.reset();
}

Result<std::unique_ptr<SearchIndex::StartingOver>> SearchIndex::startOver() {
  const std::lock_guard lock(writing_);
  if (!load_.expired()) return fail(Error::posix(EBUSY, "the search index is being made"));
  auto begun = SearchLoad::begin(files_);
  if (!begun) return fail(begun.error());
  std::shared_ptr<SearchLoad> load = *std::move(begun);
  load_ = load;
  return std::unique_ptr<StartingOver>(new StartingOver(*this, std::move(load)));
}

Result<void> SearchIndex::StartingOver::add(const VesselItems& items) {
  return load_->add(items);
}

Result<void> SearchIndex::StartingOver::commit(const Data& anchor) {
  // Domains that are deleted now are in neither of the two.
  const std::lock_guard lock(index_.writing_);
  if (auto finished = load_->finish(anchor); !finished) return finished;
  if (auto written = index_.files_.synchronizeNew(); !written) return written;
  return index_.replaceByNew();
}

/// The caller holds writing_. Who searches waits for no more than renaming a file.
Result<void> SearchIndex::replaceByNew() {
  const std::lock_guard lock(mutex_);
  close();
  if (auto replaced = files_.replaceByNew(); !replaced) {
    files_.removeNew();
    return replaced;
  }
  return openStore();
}

// Questions ---------------------------------------------------------------------------------------

Result<std::vector<std::string>> SearchIndex::search(const SearchQuery& query) {
  return read<std::vector<std::string>>([&] { return run_->search(query); });
}

Result<std::vector<std::string>> SearchIndex::recent(std::size_t limit) {
  return read<std::vector<std::string>>([&] { return run_->recent(limit); });
}

Result<std::vector<std::string>> SearchIndex::favorites() {
  return read<std::vector<std::string>>([this] { return run_->favorites(); });
}

void SearchIndex::releaseMemory() {
  const std::lock_guard lock(mutex_);
  if (store_) store_->database().releaseMemory();
}

}  // namespace mirabel
