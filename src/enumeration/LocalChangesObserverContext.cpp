#include "enumeration/LocalChangesObserverContext.h"

#include <utility>

#include "enumeration/LocalFileEnumerator.h"

namespace mirabel {

LocalChangesObserverContext::LocalChangesObserverContext(
    std::shared_ptr<VesselChangeObserver> observer,
    std::shared_ptr<LocalFileEnumerator> localFileEnumerator, bool shouldUpdateFileIDInPalimpsest)
    : observer_(std::move(observer)),
      localFileEnumerator_(std::move(localFileEnumerator)),
      shouldUpdateFileIDInPalimpsest_(shouldUpdateFileIDInPalimpsest) {}

void LocalChangesObserverContext::setFSChangesEnumerator(
    std::weak_ptr<ChangesEnumeration> enumeration) {
  fsChangesEnumerator_ = std::move(enumeration);
}

void LocalChangesObserverContext::didUpdateItems(const VesselItems& items) {
  if (shouldUpdateFileIDInPalimpsest_) {
    for (const auto& item : items)
      localFileEnumerator_->updateFileIDInPalimpsest(*item);
  }
  observer_->didUpdateItems(items);
}

void LocalChangesObserverContext::didDeleteItemsWithIdentifiers(
    const std::vector<std::string>& identifiers) {
  observer_->didDeleteItemsWithIdentifiers(identifiers);
}

void LocalChangesObserverContext::finishEnumeratingChangesUpToSyncAnchor(const Data& anchor,
                                                                         bool moreComing) {
  finish([&] { observer_->finishEnumeratingChangesUpToSyncAnchor(anchor, moreComing); });
}

void LocalChangesObserverContext::finishEnumeratingWithError(const Error& error) {
  finish([&] { observer_->finishEnumeratingWithError(error); });
}

template <class Forward>
void LocalChangesObserverContext::finish(Forward&& forward) {
  // Held until the end: its last reference may keep this context alive.
  const auto enumeration = fsChangesEnumerator_.lock();
  if (!enumeration) return;
  forward();
  localFileEnumerator_->forget(enumeration);
  fsChangesEnumerator_.reset();
}

}  // namespace mirabel
