#include <string>
#include <utility>

#include "foundation/FatalError.h"
#include "foundation/Log.h"
#include "items/LocalAppLibraryItem.h"
#include "provider/LocalVessel.h"

namespace mirabel {
namespace {

/// Nothing is written into the root: what it shows beside the documents are the app libraries.
bool isRoot(std::string_view identifier) {
  return identifier == VesselRootContainerItemIdentifier;
}

std::unexpected<Error> writeNotPermitted() {
  return fail(Error::file(FileErrorCode::writeNotPermitted));
}

}  // namespace

void LocalVessel::importDocumentAtURL(const URL& source, std::string_view toParentItemIdentifier,
                                      ItemHandler completionHandler) {
  const LogSection section("import document at " + quoted(source.path()) + " to parent " +
                           quoted(toParentItemIdentifier));
  if (isRoot(toParentItemIdentifier)) return completionHandler(writeNotPermitted());
  const auto parent = urlForIdentifier(toParentItemIdentifier);
  if (!parent) return completionHandler(fail(parent.error()));
  platform_.operations.vs_importUnderFolder(source, *parent,
                                            completion(std::move(completionHandler)));
}

void LocalVessel::createDirectoryWithName(std::string_view name,
                                          std::string_view inParentItemIdentifier,
                                          ItemHandler completionHandler) {
  const LogSection section("create directory with name " + quoted(name) + " in parent " +
                           quoted(inParentItemIdentifier));
  if (isRoot(inParentItemIdentifier)) return completionHandler(writeNotPermitted());
  const auto parent = urlForIdentifier(inParentItemIdentifier);
  if (!parent) return completionHandler(fail(parent.error()));
  platform_.operations.vs_createSubFolder(*parent, name, completion(std::move(completionHandler)));
}

void LocalVessel::renameItemWithIdentifier(std::string_view identifier, std::string_view toName,
                                           ItemHandler completionHandler,
                                           const std::optional<URL>& place) {
  const LogSection section("rename item " + quoted(identifier) + " to name " + quoted(toName));
  const auto item = urlForIdentifier(identifier, place);
  if (!item) return completionHandler(fail(item.error()));
  platform_.operations.vs_renameWithNewName(*item, toName,
                                            completion(std::move(completionHandler)));
}

void LocalVessel::reparentItemWithIdentifier(std::string_view identifier,
                                             std::string_view toParentItemWithIdentifier,
                                             std::optional<std::string> newName,
                                             ItemHandler completionHandler,
                                             const std::optional<URL>& place) {
  const LogSection section("move item " + quoted(identifier) + " to parent " +
                           quoted(toParentItemWithIdentifier));
  if (isRoot(toParentItemWithIdentifier)) return completionHandler(writeNotPermitted());
  const auto parent = _urlForItemWithPersistentIdentifier(toParentItemWithIdentifier);
  if (!parent) return completionHandler(fail(Error::nonExistentItem(toParentItemWithIdentifier)));
  const auto item = _urlForItemWithPersistentIdentifier(identifier, place);
  if (!item) return completionHandler(fail(Error::nonExistentItem(identifier)));
  platform_.operations.vs_reparentUnderFolder(*item, *parent, std::move(newName), Bouncing::refused,
                                              completion(std::move(completionHandler)));
}

void LocalVessel::deleteItemWithIdentifier(std::string_view identifier,
                                           ErrorHandler completionHandler,
                                           const std::optional<URL>& place) {
  const LogSection section("delete item " + quoted(identifier));
  const auto item = _urlForItemWithPersistentIdentifier(identifier, place);
  if (!item) return completionHandler(Error::nonExistentItem(identifier));
  deleteItem(*item, std::move(completionHandler));
}

void LocalVessel::deleteItem(const URL& item, ErrorHandler completionHandler) {
  underway_.enter();
  platform_.operations.vs_deleteWithCompletionHandler(
      item, [group = underway_,
             completionHandler = std::move(completionHandler)](std::optional<Error> error) mutable {
        completionHandler(std::move(error));
        group.leave();
      });
}

void LocalVessel::_defaultApplicationContainerForBundleIdentifier(
    std::string_view bundleIdentifier, const ItemHandler& completionHandler) const {
  const LogSection section("default location for " + std::string(bundleIdentifier));
  const auto invalid = [&] {
    return fail(Error::invalidParameter("bundleIdentifier", bundleIdentifier));
  };
  const auto proxy = platform_.applications.proxyForBundleIdentifier(bundleIdentifier);
  if (!proxy) {
    logError("can't create bundle proxy with '" + std::string(bundleIdentifier) + "'");
    return completionHandler(invalid());
  }
  if (auto item = LocalAppLibraryItem::create(context_, *proxy)) return completionHandler(item);
  logError("can't create an app library item with " + proxy->description());
  completionHandler(invalid());
}

/// What a file operation reports to. The provider waits for it at its end.
FileOperations::URLHandler LocalVessel::completion(ItemHandler completionHandler,
                                                   AfterSuccess afterSuccess) {
  underway_.enter();
  return [this, group = underway_, completionHandler = std::move(completionHandler),
          afterSuccess = std::move(afterSuccess)](const Result<URL>& outcome) mutable {
    completionHandler(itemOfOutcome(outcome, afterSuccess));
    // From here on, the provider may be gone.
    group.leave();
  };
}

LocalVessel::ItemResult LocalVessel::itemOfOutcome(const Result<URL>& outcome,
                                                   const AfterSuccess& afterSuccess) const {
  if (!outcome) return fail(mappedError(outcome.error()));
  if (!outcome->isFileURL()) fatalError("a file operation succeeded without a file URL");
  if (afterSuccess) afterSuccess(*outcome);
  return _propertiesForItemAtURL(*outcome);
}

/// A taken name as the host knows it, by the item in the way; other errors, and what is in the way
/// without being an item, as the file operation told them.
Error LocalVessel::mappedError(const Error& error) const {
  if (!error.is(FileErrorCode::fileExists)) return error;
  const auto colliding = vs_collidingURL(error);
  if (!colliding) return error;
  const auto item = _propertiesForItemAtURL(*colliding);
  return item ? Error::collision((*item)->itemIdentifier()) : error;
}

}  // namespace mirabel
