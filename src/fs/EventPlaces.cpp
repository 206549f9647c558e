#include "fs/EventPlaces.h"

#include <unordered_set>

namespace mirabel {
namespace {

constexpr std::uint32_t streamFlags = eventflag::userDropped | eventflag::kernelDropped |
                                      eventflag::eventIDsWrapped | eventflag::historyDone;

}  // namespace

bool isDocumentRecord(const FileSystemEvent& event) {
  return event.path && event.path->starts_with(".docid/");
}

EventPlaces::EventPlaces(std::span<const FileSystemEvent> events, const HiddenTest& hiddenTest,
                         const ItemLook& look, ResourceValueSource& resources) {
  std::vector<URL> inSight;
  std::unordered_set<std::string_view> paths;
  for (const FileSystemEvent& event : events) {
    const EventPlace& place = places_.emplace_back(placeOf(event, hiddenTest, look));
    if (!place.url || place.isHidden || !paths.insert(place.url->path()).second) continue;
    inSight.push_back(*place.url);
  }
  if (inSight.empty()) return;
  if (resources.prefetch(inSight)) return;
  // Identities that are not known to be on disk must not be handed out; single looks go on.
  for (const URL& url : inSight)
    url.resources().clear();
}

EventPlace EventPlaces::placeOf(const FileSystemEvent& event, const HiddenTest& hiddenTest,
                                const ItemLook& look) {
  EventPlace place;
  if (!event.path || (event.flags & streamFlags) != 0) return place;
  if (isDocumentRecord(event)) {
    place.document = DocumentIDPath::parse(*event.path);
    if (!place.document || place.document->destinationFileID == 0) return place;
    auto url = look.placeOf(static_cast<std::uint64_t>(place.document->destinationFileID));
    if (!url) place.failure = url.error();
    if (url && *url) place.url = urls_.at((*url)->path());
  } else {
    place.url = urls_.at(*event.path);
  }
  if (!place.url) return place;
  place.isMonitored = hiddenTest.isMonitored(*place.url);
  place.isHidden = hiddenTest.isHidden(*place.url);
  return place;
}

}  // namespace mirabel
