#pragma once

#include <memory>
#include <string>
#include <vector>

#include "fs/ChangesEnumeration.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

class LocalFileEnumerator;

/// Stands between one enumeration of changes and the host's observer: refreshes the file IDs of
/// updated items in the generational store for the working set, passes the batches on, and lets
/// go of the enumeration at its first finish. Called on the queue of the enumeration's reader.
class LocalChangesObserverContext final : public VesselChangeObserver {
 public:
  LocalChangesObserverContext(std::shared_ptr<VesselChangeObserver> observer,
                              std::shared_ptr<LocalFileEnumerator> localFileEnumerator,
                              bool shouldUpdateFileIDInPalimpsest);

  /// Before the enumeration starts. A finish of one that is no longer there is dropped.
  void setFSChangesEnumerator(std::weak_ptr<ChangesEnumeration> enumeration);

  void didUpdateItems(const VesselItems& items) override;
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override;
  void finishEnumeratingChangesUpToSyncAnchor(const Data& anchor, bool moreComing) override;
  void finishEnumeratingWithError(const Error& error) override;

 private:
  template <class Forward>
  void finish(Forward&& forward);

  std::shared_ptr<VesselChangeObserver> observer_;
  std::shared_ptr<LocalFileEnumerator> localFileEnumerator_;
  bool shouldUpdateFileIDInPalimpsest_;
  std::weak_ptr<ChangesEnumeration> fsChangesEnumerator_;
};

}  // namespace mirabel
