#pragma once

#include <memory>
#include <optional>
#include <string>

#include "foundation/URL.h"
#include "items/LocalItem.h"
#include "platform/EventStreams.h"

namespace mirabel {

class FSEventReader;

/// Why an event became neither an update nor a deletion.
enum class DropReason {
  noPath,              ///< the event holds none
  unparsable,          ///< a document record of another form
  hidden,              ///< at a place that is not shown
  noObject,            ///< nothing is there, and the event does not say what was
  noPlace,             ///< the object of a document record lies nowhere any more
  notMonitored,        ///< the document lies outside the reader's folders
  noItem,              ///< nothing is left where the document lay
  identifierMismatch,  ///< another document lies there now
  lookFailed,          ///< something is there that could not be looked at: `lookError` tells why
};

/// What an event reader tells its owner. Every call is made on the reader's `streamQueue`.
class FSEventReaderDelegate {
 public:
  virtual ~FSEventReaderDelegate() = default;

  /// An item was created or changed. `url` is the event's; the item's own URL tells where it lies
  /// now, which is elsewhere when it was moved away from there.
  virtual void didUpdateItem(FSEventReader& reader, const std::shared_ptr<LocalItem>& item,
                             const URL& url) = 0;
  /// An item is gone; without a URL for a document record.
  virtual void didDeleteItem(FSEventReader& reader, const std::string& identifier,
                             const std::optional<URL>& url) = 0;
  /// The replay has reached the present.
  virtual void didFinishHistory(FSEventReader& reader) = 0;
  /// Events were lost or their IDs wrapped: what was read is incomplete.
  virtual void mustRestart(FSEventReader& reader) = 0;
  /// After each batch.
  virtual void didProcessEvents(FSEventReader& reader) = 0;

  /// The event is told of in no other way. `url` is its place as far as it is known.
  virtual void didDropEvent(FSEventReader& reader, const FileSystemEvent& event,
                            const std::optional<URL>& url, DropReason reason);
};

}  // namespace mirabel
