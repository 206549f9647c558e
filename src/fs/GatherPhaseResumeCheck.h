#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundation/URL.h"
#include "items/LocalItem.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// Whether a listing may go on where its last page ended.
struct FSEventReaderGatherPhaseResumeStatus {
  enum class Case {
    deletionOccurred,              ///< something under the folders was deleted: start over
    canResume,                     ///< the history is complete and holds no deletion
    cantReplayHistoricalFSEvents,  ///< the history has a gap, or cannot be had: start over
  };
  Case status = Case::canResume;
  std::string deletedItem;  ///< of `deletionOccurred`: "[identifier, path:'…']"

  friend bool operator==(const FSEventReaderGatherPhaseResumeStatus&,
                         const FSEventReaderGatherPhaseResumeStatus&) = default;
};

/// The answer of the check, with what else the replay brought to light.
struct GatherPhaseResumeCheck {
  FSEventReaderGatherPhaseResumeStatus status;
  /// The last event that was processed: where the next check starts.
  std::uint64_t lastProcessedFSEventID = 0;
  /// Names may have come or left: a place that is kept may have another offset by now.
  bool haveNamesChanged = false;
  /// A name no longer stands for what it stood for: counting entries from the start may not lead
  /// to the same place again.
  bool hasNameLeft = false;
  /// A folder was moved: a walk that enters folders may pass its contents by.
  bool hasFolderMoved = false;
};

/// Replays what happened in the folders `on` since the event ID that was kept with the last page.
/// Blocks until the history is read, without a time limit. Any thread but an event queue's.
[[nodiscard]] GatherPhaseResumeCheck canResumeGatherPhase(const ItemContext& context,
                                                          EventStreams& events,
                                                          const std::vector<URL>& on,
                                                          std::uint64_t previousEventID);

}  // namespace mirabel
