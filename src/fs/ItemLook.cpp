#include "fs/ItemLook.h"

#include <cerrno>

#include "foundation/LookFailure.h"
#include "items/LocalAppLibraryItem.h"

namespace mirabel {

ItemLook::ItemLook(const ItemContext& context, const HiddenTest& hiddenTest)
    : context_(context), hiddenTest_(hiddenTest) {}

Result<std::shared_ptr<LocalItem>> ItemLook::at(const URL& url) const {
  if (auto library = appLibraryAt(url)) return library;
  if (auto item = LocalItem::create(context_, url)) return item;
  return again(url);
}

std::shared_ptr<LocalItem> ItemLook::appLibraryAt(const URL& url) const {
  if (url.lastPathComponent() != "Documents") return nullptr;
  const auto proxy = context_.platform.applications.proxyAt(url);
  return proxy ? LocalAppLibraryItem::create(context_, *proxy) : nullptr;
}

/// A second look with an empty cache: it tells what is wrong, or finds that nothing is any more.
Result<std::shared_ptr<LocalItem>> ItemLook::again(const URL& url) const {
  const URL fresh = URL::fileURL(url.path());
  const auto values = context_.platform.resources.readValues(fresh);
  if (!values && saysOutOfReach(values.error())) return nullptr;
  if (!values) return fail(values.error());
  if (auto item = LocalItem::create(context_, fresh)) return item;
  // What is hidden may be no item for good reason; what left the monitored folders is not ours.
  if (hiddenTest_.isHidden(fresh)) return nullptr;
  // The application has gone, and its library is about to.
  if (context_.identity.isAppLibraryRoot(fresh)) return nullptr;
  return fail(Error::posix(EIO, "can't make an item of \"" + fresh.path() + "\""));
}

Result<std::shared_ptr<LocalItem>> ItemLook::ofFileID(std::uint64_t fileID) const {
  const auto place = placeOf(fileID);
  if (!place) return fail(place.error());
  if (!*place) return nullptr;
  return at(**place);
}

Result<std::optional<URL>> ItemLook::placeOf(std::uint64_t fileID) const {
  if (auto url = context_.identity.fileURLWithFileIdentifier(fileID)) return url;
  return placeAgain(fileID);
}

/// The identity operations say no more than that they found nothing: asked for the reason.
Result<std::optional<URL>> ItemLook::placeAgain(std::uint64_t fileID) const {
  const URL& storage = context_.platform.manager.documentStorageURL();
  const auto device = context_.identity.deviceIDWithError(storage);
  const auto path = device ? context_.platform.objects.pathOfFileID(*device, fileID)
                           : Result<std::string>(fail(device.error()));
  if (path) return URL::fileURL(*path);
  if (path.error().isPosix(ENOENT)) return std::nullopt;
  return fail(path.error());
}

}  // namespace mirabel
