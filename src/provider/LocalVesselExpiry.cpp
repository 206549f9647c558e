#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <semaphore>
#include <string>
#include <utility>

#include "foundation/KeyedArchive.h"
#include "foundation/Log.h"
#include "fs/FSDirectoryEnumerator.h"
#include "items/AttributeNames.h"
#include "provider/LocalVessel.h"

namespace mirabel {
namespace {

constexpr std::string_view trashName = ".Trash";

/// Few enough that a trash of any size costs no memory, and that a deletion follows its decision
/// closely: meanwhile somebody may put an item back and trash another one under its name.
constexpr std::ptrdiff_t mostDeletionsUnderway = 64;

/// One level: what lies in a trashed folder was not trashed by itself, carries no date and is to
/// get none. Hidden names as well, for people trash these too; they would be kept for ever.
constexpr EnumeratorOptions oneLevel{EnumeratorOptions::skipsPackageDescendants,
                                     EnumeratorOptions::skipsSubdirectoryDescendants};

FSDirectoryEnumerator entriesOf(URL folder) {
  return {.urls = {std::move(folder)},
          .limit = std::numeric_limits<std::uint64_t>::max(),
          .directoryEnumerationOptionsFor = [](const URL&) { return oneLevel; }};
}

}  // namespace

/// The deletions of one request.
struct LocalVessel::Removals {
  DispatchGroup group;
  std::counting_semaphore<> room{mostDeletionsUnderway};
};

void LocalVessel::_removeTrashedItemsOlderThanDate(const Date& date,
                                                   ErrorHandler completionHandler) {
  const LogSection section("remove trashed items older than " + date.rfc3339());
  underway_.enter();
  const auto removals = std::make_shared<Removals>();
  forEachTrashedEntry(
      [&](const TrashedEntry& entry) { removeIfTrashedBefore(date, entry, removals); });
  logDebug("wait until all deletions are complete");
  removals->group.notify(SerialQueue("mirabel.auto-delete.notifier"),
                         [group = underway_, done = std::move(completionHandler)]() mutable {
                           done(std::nullopt);
                           // From here on, the provider may be gone.
                           group.leave();
                         });
}

void LocalVessel::forEachTrashedEntry(
    const std::function<void(const TrashedEntry&)>& visitor) const {
  const auto visit = [&](const URL& url) -> Result<void> {
    if (!url.lastPathComponent().starts_with(unfinishedNamePrefix)) {
      visitor({url, trashDateOf(url)});
    }
    return {};
  };
  std::vector<URL> trashFolders;
  for (const URL& folder : roots_.folders())
    trashFolders.push_back(folder.appendingPathComponent(trashName));
  trashFolders.push_back(platform_.manager.documentStorageURL().appendingPathComponent(trashName));
  for (URL& folder : trashFolders) {
    // Most folders have no trash, and what is wrong with one of them is not the others' concern.
    static_cast<void>(
        entriesOf(std::move(folder)).enumerate(platform_.directories, platform_.resources, visit));
  }
}

Result<std::optional<Date>> LocalVessel::trashDateOf(const URL& url) const {
  const auto payload = extendedAttribute(platform_.attributes, attributename::trashDate, url);
  if (!payload) return std::nullopt;
  auto date = keyedarchive::unarchiveDate(*payload);
  if (!date) return fail(date.error());
  return *date;
}

/// An entry that nobody knows the age of is new from now on.
void LocalVessel::removeIfTrashedBefore(const Date& date, const TrashedEntry& entry,
                                        const std::shared_ptr<Removals>& removals) {
  const auto& trashDate = entry.trashDate;
  if (!trashDate || !*trashDate) {
    logDebug([&] {
      const std::string failure =
          trashDate ? "can't find trash date" : "can't unarchive xattr data";
      return failure + " for URL " + quoted(entry.url.path()) + "; set current date";
    });
    return setTrashDate(entry.url, platform_.clock.now());
  }
  if (**trashDate >= date) return;
  auto identifier = _persistentIdentifierForItemAt(entry.url);
  if (!identifier) {
    return logError("identifier lookup failed for URL " + quoted(entry.url.path()));
  }
  logDebug([&] {
    return "item " + *identifier + " was trashed before reference date, let's remove it";
  });
  removals->room.acquire();
  removals->group.enter();
  deleteTrashedItem(*identifier, entry.url, [removals, identifier](const auto& error) {
    if (error) logError("can't remove item " + *identifier + "; " + error->description());
    removals->room.release();
    removals->group.leave();
  });
}

void LocalVessel::deleteTrashedItem(std::string_view identifier, const URL& entry,
                                    ErrorHandler completionHandler) {
  const LogSection section("delete item " + quoted(identifier));
  const auto item = _urlForItemWithPersistentIdentifier(identifier);
  if (!item) return completionHandler(Error::nonExistentItem(identifier));
  // The identifier leads elsewhere when the item was put back this moment, and may do so when it
  // is a file of which another hard link lies in the documents. Only what is in the trash goes.
  const bool isSamePlace = item->properURL() == entry.properURL();
  deleteItem(isSamePlace ? *item : entry, std::move(completionHandler));
}

}  // namespace mirabel
