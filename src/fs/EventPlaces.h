#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <vector>

#include "foundation/URL.h"
#include "fs/DocumentIDPath.h"
#include "fs/HiddenTest.h"
#include "fs/ItemLook.h"
#include "fs/SharedURLs.h"
#include "platform/EventStreams.h"

namespace mirabel {

/// Where one event leads.
struct EventPlace {
  std::optional<DocumentIDPath> document{};  ///< of a document record that could be parsed
  std::optional<URL> url{};                  ///< of a document record: where the document lies now
  std::optional<Error> failure{};            ///< why the URL of a document record cannot be told
  bool isMonitored = false;
  bool isHidden = false;
};

/// Whether the event is a document record.
[[nodiscard]] bool isDocumentRecord(const FileSystemEvent& event);

/// The places that the events of one batch lead to, with everything in sight looked at in one go:
/// a look for each would cost a durable write for each. Events of one folder share its URL and so
/// its resource cache. What is seen is newer than the batch, so that whatever changes after the
/// look comes with a later one.
class EventPlaces {
 public:
  EventPlaces(std::span<const FileSystemEvent> events, const HiddenTest& hiddenTest,
              const ItemLook& look, ResourceValueSource& resources);

  [[nodiscard]] const EventPlace& operator[](std::size_t index) const { return places_[index]; }

 private:
  [[nodiscard]] EventPlace placeOf(const FileSystemEvent& event, const HiddenTest& hiddenTest,
                                   const ItemLook& look);

  std::vector<EventPlace> places_;
  SharedURLs urls_;
};

}  // namespace mirabel
