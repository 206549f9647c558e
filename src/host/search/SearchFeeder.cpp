#include "host/search/SearchFeeder.h"

#include <cerrno>
#include <condition_variable>
#include <optional>
#include <utility>

#include "foundation/Log.h"

namespace mirabel {
namespace {

// A listing expires when something that it has told was deleted meanwhile. On a disk where that
// never ends, the next signal tries again.
constexpr int mostListings = 10;

bool isExpired(const Result<void>& outcome) {
  return !outcome && outcome.error().is(VesselErrorCode::syncAnchorExpired);
}

Error stopped() {
  return Error::posix(ECANCELED, "feeding the search index was stopped");
}

/// Hands the items of one page on.
class Page final : public VesselEnumerationObserver {
 public:
  explicit Page(SearchIndex::StartingOver& content) : content_(content) {}

  void didEnumerateItems(const VesselItems& items) override {
    if (outcome) outcome = content_.add(items);
  }
  void finishEnumeratingUpToPage(const std::optional<Data>& page) override { next = page; }
  void finishEnumeratingWithError(const Error& error) override { outcome = fail(error); }

  Result<void> outcome;
  std::optional<Data> next;

 private:
  SearchIndex::StartingOver& content_;
};

/// One batch of changes. Whoever tells it may outlive who waits for it.
class Batch final : public VesselChangeObserver {
 public:
  /// Returns when everything has been told.
  [[nodiscard]] Result<void> wait(const std::stop_token& stop) {
    std::unique_lock lock(mutex_);
    if (!isOver_.wait(lock, stop, [this] { return outcome_.has_value(); })) return fail(stopped());
    return *outcome_;
  }

  // What was told, once `wait` has returned without an error.
  VesselItems updated;
  std::vector<std::string> deleted;
  Data anchor;
  bool moreComing = false;

  void didUpdateItems(const VesselItems& items) override {
    updated.insert(updated.end(), items.begin(), items.end());
  }
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override {
    deleted.insert(deleted.end(), identifiers.begin(), identifiers.end());
  }
  void finishEnumeratingChangesUpToSyncAnchor(const Data& reached, bool more) override {
    anchor = reached;
    moreComing = more;
    finish({});
  }
  void finishEnumeratingWithError(const Error& error) override { finish(fail(error)); }

 private:
  void finish(Result<void> outcome) {
    const std::lock_guard lock(mutex_);
    outcome_ = std::move(outcome);
    isOver_.notify_all();
  }

  std::mutex mutex_;
  std::condition_variable_any isOver_;
  std::optional<Result<void>> outcome_;
};

}  // namespace

Result<void> SearchFeeder::catchUp(VesselEnumerator& workingSet, const std::stop_token& stop) {
  const std::lock_guard lock(mutex_);
  bool isUsable = true;
  for (int listings = 0; listings < mostListings; ++listings) {
    auto anchor = isUsable ? index_.anchor() : std::nullopt;
    Result<void> outcome;
    if (!anchor) {
      auto listed = list(workingSet, stop);
      if (!listed) outcome = fail(listed.error());
      if (listed) anchor = *std::move(listed);
    }
    if (anchor) outcome = followChanges(workingSet, *std::move(anchor), stop);
    if (!isExpired(outcome)) return outcome;
    isUsable = false;
  }
  return fail(Error::syncAnchorExpired());
}

Result<Data> SearchFeeder::list(VesselEnumerator& workingSet, const std::stop_token& stop) {
  // Before the listing: what it passes over because it happens meanwhile is told as a change.
  std::optional<Data> anchor;
  workingSet.currentSyncAnchor([&](std::optional<Data> answer) { anchor = std::move(answer); });
  if (!anchor) return fail(Error::local(LocalVesselError::unableToGetDeviceUUID));
  const auto content = index_.startOver();
  if (!content) return fail(content.error());
  Data next = dataFromString(VesselInitialPageSortedByName);
  while (!stop.stop_requested()) {
    Page page(**content);
    workingSet.enumerateItems(page, next);
    if (!page.outcome) return fail(page.outcome.error());
    if (!page.next) {
      if (auto committed = (*content)->commit(*anchor); !committed) return fail(committed.error());
      return *std::move(anchor);
    }
    next = *std::move(page.next);
  }
  return fail(stopped());
}

Result<void> SearchFeeder::followChanges(VesselEnumerator& workingSet, Data anchor,
                                         const std::stop_token& stop) {
  while (!stop.stop_requested()) {
    const auto batch = std::make_shared<Batch>();
    workingSet.enumerateChanges(batch, anchor);
    if (auto told = batch->wait(stop); !told) return told;
    const bool isNews =
        !batch->updated.empty() || !batch->deleted.empty() || batch->anchor != anchor;
    if (isNews) {
      auto applied = index_.apply(batch->updated, batch->deleted, batch->anchor);
      if (!applied) return applied;
    }
    if (!batch->moreComing) return {};
    anchor = std::move(batch->anchor);
  }
  return fail(stopped());
}

}  // namespace mirabel
