#pragma once

#include <mutex>
#include <stop_token>

#include "host/search/SearchIndex.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// Brings the search index in step with the working set, as any host keeps its copy of a container.
/// Any thread may call it; calls come one after the other.
class SearchFeeder {
 public:
  /// `index` outlives it.
  explicit SearchFeeder(SearchIndex& index) : index_(index) {}

  /// Asks for the changes since the index's anchor, batch by batch, until there are none. Without
  /// an anchor, and where the anchor expired, the working set is listed first. The enumerator is
  /// asked by this thread, under no lock of the index. Errors: those of the enumerator and of the
  /// index; `syncAnchorExpired` when listings expired time and again, which may be tried later;
  /// POSIX ECANCELED when it was asked to stop. Whatever the error, what was committed stays.
  [[nodiscard]] Result<void> catchUp(VesselEnumerator& workingSet,
                                     const std::stop_token& stop = {});

 private:
  /// Answers the anchor that the rows have now.
  [[nodiscard]] Result<Data> list(VesselEnumerator& workingSet, const std::stop_token& stop);
  [[nodiscard]] Result<void> followChanges(VesselEnumerator& workingSet, Data anchor,
                                           const std::stop_token& stop);

  SearchIndex& index_;
  std::mutex mutex_;
};

}  // namespace mirabel
