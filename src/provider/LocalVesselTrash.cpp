#include <cerrno>
#include <string>
#include <utility>

#include "foundation/Log.h"
#include "items/AttributeNames.h"
#include "items/LocalAppLibraryItem.h"
#include "provider/AttributePayload.h"
#include "provider/LocalVessel.h"
#include "provider/TrashPlaces.h"

namespace mirabel {
namespace {

/// The name that a put-back wants for the item: it may have got another one in the trash.
std::optional<std::string> nameBeforeTrash(const LocalItem& item) {
  const auto& putBack = item.putBackURL();
  if (!putBack) return {};
  return std::string(putBack->lastPathComponent());
}

}  // namespace

void LocalVessel::trashItemWithIdentifier(std::string_view identifier,
                                          ItemHandler completionHandler,
                                          const std::optional<URL>& place) {
  const LogSection section("trash item " + quoted(identifier));
  const auto item = _urlForItemWithPersistentIdentifier(identifier, place);
  if (!item) return completionHandler(fail(Error::nonExistentItem(identifier)));
  const auto trash = trashFolderFor(*item);
  if (!trash) return completionHandler(fail(trash.error()));
  logDebug([&] { return "trash is located at " + quoted(trash->path()); });
  if (item->path() == trash->path()) {
    return completionHandler(fail(Error::posix(EPERM, "it is the trash itself")));
  }
  if (const auto made = platform_.operations.createDirectory(*trash); !made) {
    return completionHandler(fail(made.error()));
  }
  const auto note = [this, preTrashURL = *item](const URL& trashed) {
    setTrashDate(trashed, platform_.clock.now());
    setPutBackString(preTrashURL, trashed);
  };
  platform_.operations.vs_trashUnderFolder(*item, *trash,
                                           completion(std::move(completionHandler), note));
}

/// Whether it can be written changes nothing for the item, which was moved.
void LocalVessel::setTrashDate(const URL& url, const std::optional<Date>& date) const {
  logDebug([&] { return "setting trash date on " + url.description(); });
  static_cast<void>(writeAttribute(attributename::trashDate,
                                   attributePayload(date, keyedarchive::archiveDate), url));
}

void LocalVessel::setPutBackString(const URL& preTrashURL, const URL& trashedURL) const {
  logDebug([&] { return "setting putback string on " + trashedURL.description(); });
  const auto owner = context_.owners.applicationOwning(preTrashURL);
  if (!owner) return logError("couldn't find app library for " + preTrashURL.description());
  const auto library = LocalAppLibraryItem::create(context_, *owner);
  if (!library) return;
  const auto place = putBackString(preTrashURL, library->fileURL());
  if (!place) {
    return logError("could't compute putback string (path: " + preTrashURL.path() +
                    ", basePath: " + library->fileURL().path());
  }
  const auto archive = keyedarchive::archiveString(*place);
  logDebug([&] { return "setting putback '" + *place + "' on " + trashedURL.description(); });
  const auto error = writeAttribute(attributename::putBack,
                                    archive ? std::optional(*archive) : std::nullopt, trashedURL);
  if (!error) return;
  logError("couldn't set putback xattr (" + *place + ") on " + trashedURL.description() + "; " +
           error->description());
}

void LocalVessel::untrashItemWithIdentifier(
    std::string_view identifier, const std::optional<std::string>& toParentItemIdentifier,
    ItemHandler completionHandler, std::optional<std::string> formerName,
    const std::optional<URL>& place) {
  const LogSection section("untrash item " + quoted(identifier));
  const auto url = _urlForItemWithPersistentIdentifier(identifier, place);
  const auto item = url ? lookUpItem(identifier, place) : nullptr;
  if (!item) return completionHandler(fail(Error::nonExistentItem(identifier)));
  const Error unfit = Error::invalidParameter("itemIdentifier", identifier);
  if (!item->isTrashed()) {
    logDebug("item is not in trash");
    return completionHandler(fail(unfit));
  }
  const auto folder = untrashDestination(*item, toParentItemIdentifier);
  if (!folder) {
    logDebug("can't compute valid parent URL for " + std::string(identifier));
    return completionHandler(fail(unfit));
  }
  if (!formerName) formerName = nameBeforeTrash(*item);
  const auto clear = [this](const URL& restored) {
    logDebug("removing trash date xattr");
    setTrashDate(restored, std::nullopt);
  };
  platform_.operations.vs_reparentUnderFolder(*url, *folder, std::move(formerName),
                                              Bouncing::allowed,
                                              completion(std::move(completionHandler), clear));
}

std::optional<URL> LocalVessel::untrashDestination(
    const LocalItem& item, const std::optional<std::string>& parentIdentifier) const {
  auto folder = parentIdentifier ? untrashParent(*parentIdentifier) : std::nullopt;
  if (!folder) folder = putBackFolder(item);
  if (!folder) folder = appLibraryRoot(item);
  return folder;
}

std::optional<URL> LocalVessel::untrashParent(std::string_view identifier) const {
  auto parent = _urlForItemWithPersistentIdentifier(identifier);
  if (!parent || !isInTrash(*parent)) return parent;
  logDebug([&] {
    return "can't use provided parent item " + std::string(identifier) + " because it's trashed; " +
           parent->path();
  });
  return {};
}

/// The folder that held the item, if it is still one that can. What lay at the put-back URL itself
/// is in the trash, and its name, see `nameBeforeTrash`, goes with it wherever it is put back.
std::optional<URL> LocalVessel::putBackFolder(const LocalItem& item) const {
  const auto& putBack = item.putBackURL();
  if (!putBack) {
    logDebug("no putback url");
    return {};
  }
  URL folder = URL::fileURL(putBack->deletingLastPathComponent().path());
  const auto isFolder = ResourceReader(platform_.resources).value(ResourceKey::isDirectory, folder);
  if (isInTrash(folder) || !isFolder || *isFolder != ResourceValue(true)) {
    logDebug([&] { return "putback url is not reachable; " + putBack->description(); });
    return {};
  }
  logDebug([&] { return "putback url is " + putBack->description(); });
  return folder;
}

std::optional<URL> LocalVessel::appLibraryRoot(const LocalItem& item) const {
  if (item.itemIdentifier().starts_with('#')) return {};
  const auto owner = context_.owners.applicationOwning(item.fileURL());
  const auto library = owner ? LocalAppLibraryItem::create(context_, *owner) : nullptr;
  if (!library) return {};
  logDebug([&] { return "use " + library->itemIdentifier() + "'s root as recover location"; });
  return library->fileURL();
}

}  // namespace mirabel
