#include "host/Searching.h"

#include <chrono>
#include <utility>

#include "foundation/Log.h"
#include "host/LocalContainer.h"
#include "host/SearchableItems.h"

namespace mirabel {
namespace {

// After a failure that nothing signals the end of: too many open files, no room.
constexpr std::chrono::seconds beforeNextTry{10};

}  // namespace

Searching::~Searching() {
  stop();
  feeding_ = {};
  if (workingSet_) workingSet_->invalidate();
}

Result<SearchIndex*> Searching::inStep() {
  const auto index = provider_.searchableItems().index();
  if (!index) return fail(index.error());
  {
    const std::lock_guard lock(mutex_);
    if (!feeder_) feeder_ = std::make_unique<SearchFeeder>(**index);
    if (!workingSet_) {
      auto made = provider_.vessel().enumeratorForContainerItemIdentifier(
          VesselWorkingSetContainerItemIdentifier, LiveUpdates::unwanted);
      if (!made) return fail(made.error());
      workingSet_ = *std::move(made);
    }
  }
  if (auto fed = feeder_->catchUp(*workingSet_, stopping_.get_token()); !fed)
    return fail(reasonFor(fed.error(), provider_));
  return *index;
}

void Searching::follow(ContainerWatches& watches) {
  feeding_ = std::jthread([this, &watches] { feed(stopping_.get_token(), watches); });
}

Result<void> Searching::beginWatch(ContainerWatches& watches, const std::function<void()>& changed,
                                   std::unique_ptr<ContainerWatch>& watch) {
  auto begun = watches.add(std::string(VesselWorkingSetContainerItemIdentifier), changed,
                           ContainerWatches::Wake::forAnySignal);
  if (!begun) return fail(begun.error());
  watch = *std::move(begun);
  return {};
}

Result<void> Searching::feedOnce() {
  const auto index = inStep();
  if (!index) return fail(index.error());
  return {};
}

void Searching::feed(const std::stop_token& stop, ContainerWatches& watches) {
  std::mutex mutex;
  std::condition_variable_any wake;
  bool hasChanged = true;
  // Whatever is signalled: whether there is anything for the index shows when it is asked for.
  const auto changed = [&] {
    {
      const std::lock_guard lock(mutex);
      hasChanged = true;
    }
    wake.notify_one();
  };
  std::unique_ptr<ContainerWatch> watch;
  while (!stop.stop_requested()) {
    const auto begun = watch ? Result<void>() : beginWatch(watches, changed, watch);
    {
      std::unique_lock lock(mutex);
      wake.wait(lock, stop, [&] { return hasChanged; });
      hasChanged = false;
    }
    if (stop.stop_requested()) return;
    const auto fed = begun ? feedOnce() : begun;
    if (fed || stop.stop_requested()) continue;
    logError("can't bring the search index in step; " + fed.error().description());
    std::unique_lock lock(mutex);
    wake.wait_for(lock, stop, beforeNextTry, [] { return false; });
    hasChanged = true;
  }
}

Result<std::vector<std::string>> Searching::search(const SearchQuery& query) {
  const auto index = inStep();
  if (!index) return fail(index.error());
  return (*index)->search(query);
}

Result<std::vector<std::string>> Searching::recent(std::size_t limit) {
  const auto index = inStep();
  if (!index) return fail(index.error());
  return (*index)->recent(limit);
}

Result<std::vector<std::string>> Searching::favorites(std::size_t limit) {
  const auto index = inStep();
  if (!index) return fail(index.error());
  auto found = (*index)->favorites();
  if (found && found->size() > limit) found->resize(limit);
  return found;
}

}  // namespace mirabel
