#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mirabel/Containers.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

class LocalItem;

using VesselItems = std::vector<std::shared_ptr<LocalItem>>;

/// The other page that starts a listing.
inline constexpr std::string_view VesselInitialPageSortedByDate = "VesselInitialPageSortedByDate";

/// What the host hands over to be told one page of a listing: `didEnumerateItems` once or twice,
/// or not at all, then exactly one of the two finishing calls. Called on the thread that asked.
class VesselEnumerationObserver {
 public:
  virtual ~VesselEnumerationObserver() = default;
  virtual void didEnumerateItems(const VesselItems& items) = 0;
  /// Nothing when the listing is complete.
  virtual void finishEnumeratingUpToPage(const std::optional<Data>& nextPage) = 0;
  virtual void finishEnumeratingWithError(const Error& error) = 0;
};

/// What the host hands over to be told changes: any number of batches, then exactly one of the
/// two finishing calls. Called on a queue of the enumeration, one call at a time.
class VesselChangeObserver {
 public:
  virtual ~VesselChangeObserver() = default;
  virtual void didUpdateItems(const VesselItems& items) = 0;
  virtual void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) = 0;
  /// With `moreComing` the host asks again from `anchor` at once.
  virtual void finishEnumeratingChangesUpToSyncAnchor(const Data& anchor, bool moreComing) = 0;
  virtual void finishEnumeratingWithError(const Error& error) = 0;
};

/// Lists one container and tells its changes. The host may call it from any thread.
class VesselEnumerator {
 public:
  virtual ~VesselEnumerator() = default;
  /// Returns when the page has been handed over. An error with the code `syncAnchorExpired`
  /// means that the listing has to start over.
  virtual void enumerateItems(VesselEnumerationObserver& observer, const Data& page) = 0;
  /// Returns when the enumeration has started; `observer` is kept until it has finished. An error
  /// with the code `syncAnchorExpired` means that the container has to be listed again.
  virtual void enumerateChanges(std::shared_ptr<VesselChangeObserver> observer,
                                const Data& anchor) = 0;
  /// Calls the handler once, before it returns, with nothing when no anchor can be had.
  virtual void currentSyncAnchor(
      const std::function<void(std::optional<Data>)>& completionHandler) = 0;
  /// The host has no more use for it: nothing is told any more, live changes included.
  virtual void invalidate() = 0;
};

}  // namespace mirabel
