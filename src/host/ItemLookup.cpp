#include "host/ItemLookup.h"

#include <cerrno>
#include <filesystem>
#include <system_error>

#include "foundation/LookFailure.h"
#include "linux/apps/LinuxApplicationRegistry.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

Error withDetail(Error error, std::string detail) {
  error.userInfo[std::string(errorkey::detail)] = std::move(detail);
  return error;
}

bool isWithin(const std::string& path, const std::string& folder) {
  return path == folder || (path.starts_with(folder) && path[folder.size()] == '/');
}

}  // namespace

const std::string& ItemLookup::storage() const {
  return provider_.platform().manager.documentStorageURL().path();
}

std::optional<std::string> ItemLookup::reasonLeftOut(std::string_view bundle) const {
  for (const LeftOut& leftOut : provider_.linuxPlatform().applications().leftOut())
    if (leftOut.identifier == bundle) return "it is left out: " + leftOut.reason;
  return {};
}

bool ItemLookup::isLibrary(const URL& url) const {
  return provider_.libraries().shared().bundleProxyWithRootURL(url).has_value();
}

bool ItemLookup::isWithinLibrary(const URL& url) const {
  return isLibrary(url) || provider_.libraries().applicationOwning(url).has_value();
}

// The provider answers for every application that has a folder for documents, but nothing follows
// what lies in one that is not listed.
bool ItemLookup::isShown(const LocalItem& item) const {
  return !item.itemIdentifier().starts_with('#') || isLibrary(item.fileURL());
}

// The document storage may be named by a link to it, "~/Documents" for one, and so may the folder
// of an app library.
std::string ItemLookup::withoutLinkToRoot(const std::string& path) const {
  std::error_code failure;
  const fs::path target = fs::canonical(path, failure);
  if (failure || target == path) return path;
  const bool isRoot = target == storage() || isLibrary(URL::fileURL(target.native()));
  return isRoot ? target.native() : path;
}

Result<std::shared_ptr<LocalItem>> ItemLookup::byIdentifier(std::string_view identifier) const {
  auto item = provider_.vessel().itemForIdentifier(identifier);
  if (item && isShown(**item)) return item;
  if (identifier.starts_with('#')) {
    auto reason = reasonLeftOut(identifier.substr(1));
    if (!reason && item) reason = "the application is there, but its documents are not shown";
    if (reason) {
      return fail(withDetail(Error::local(LocalVesselError::itemNotFound), *std::move(reason)));
    }
  }
  if (!item) return byIdentifierAgain(identifier);
  return fail(Error::nonExistentItem(identifier));
}

Result<std::shared_ptr<LocalItem>> ItemLookup::byIdentifierAgain(
    std::string_view identifier) const {
  const auto url = provider_.identity().findItem(identifier);
  if (!url) return fail(url.error());
  if (!*url) return fail(Error::nonExistentItem(identifier));
  const auto values = provider_.platform().resources.readValues(**url);
  const bool isRoot = identifier == VesselRootContainerItemIdentifier;
  if (!values && isRoot && saysAbsent(values.error())) {
    return fail(Error::posix(ENOENT, "the document storage \"" + storage() + "\""));
  }
  // Other errors have a detail that is to stand, or need none.
  if (!values && isRoot && (values.error().isPosix(EACCES) || values.error().isPosix(EIO))) {
    return fail(withDetail(values.error(), "the document storage \"" + storage() + "\""));
  }
  if (!values && (isRoot || !saysOutOfReach(values.error()))) return fail(values.error());
  auto item = provider_.vessel().itemForIdentifier(identifier);
  if (item && isShown(**item)) return item;
  return fail(Error::nonExistentItem(identifier));
}

Result<std::shared_ptr<LocalItem>> ItemLookup::atPath(const std::string& path) const {
  const std::string place = withoutLinkToRoot(path);
  const URL url = URL::fileURL(place);
  if (auto values = provider_.platform().resources.readValues(url); !values) {
    return fail(values.error());
  }
  const Error unknown = Error::local(LocalVesselError::itemNotFound);
  if (!isWithin(place, storage()) && !isWithinLibrary(url)) {
    return fail(withDetail(unknown, "it is not below the document storage \"" + storage() +
                                        "\", nor in the folder of an app library"));
  }
  if (auto item = provider_.vessel()._propertiesForItemAtURL(url)) return item;
  return fail(withDetail(unknown, "it is not shown as an item"));
}

}  // namespace mirabel
