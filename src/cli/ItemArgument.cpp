#include "cli/ItemArgument.h"

#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdint>
#include <filesystem>
#include <system_error>

namespace mirabel {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view rootWord = "root";

Error withDetail(Error error, std::string detail) {
  error.userInfo[std::string(errorkey::detail)] = std::move(detail);
  return error;
}

bool isNumber(std::string_view text) {
  std::int64_t number = 0;
  const auto [end, failure] = std::from_chars(text.begin(), text.end(), number);
  return failure == std::errc() && end == text.end() && text[0] != '-';
}

bool hasForm(std::string_view identifier) {
  if (identifier.starts_with('#')) return identifier.size() > 1;
  if (identifier.starts_with("fid=") || identifier.starts_with("did=")) {
    return isNumber(identifier.substr(4));
  }
  return true;
}

// On the way to a name, what is no folder and what is missing are the same: nothing is there.
Error placeError(const std::error_code& failure) {
  return Error::posix(failure.value() == ENOTDIR ? ENOENT : failure.value());
}

// The kernel resolves what is shorter than PATH_MAX in one go; of a longer path, as much as that.
// Beyond it there may be no links anyway: nothing below the documents is reached through one.
Result<fs::path> resolvedFolder(const fs::path& folder) {
  const std::string& text = folder.native();
  const std::size_t end = text.size() < PATH_MAX ? text.size() : text.rfind('/', PATH_MAX - 1);
  std::error_code failure;
  const fs::path resolved = fs::canonical(text.substr(0, end), failure);
  if (failure) return fail(placeError(failure));
  return fs::path(resolved.native() + text.substr(end));
}

Result<std::string> resolved(const std::string& path) {
  if (path.empty()) return fail(Error::posix(ENOENT));
  std::error_code failure;
  fs::path absolute = fs::absolute(path, failure);
  if (failure) return fail(placeError(failure));
  // Of a path that ends with a slash, the folder before it is meant.
  while (!absolute.has_filename() && absolute != absolute.root_path()) {
    absolute = absolute.parent_path();
  }
  const fs::path name = absolute.filename();
  const bool isName = absolute.has_filename() && name != "." && name != "..";
  auto folder = resolvedFolder(isName ? absolute.parent_path() : absolute);
  if (!folder) return fail(folder.error());
  return (isName ? *folder / name : *folder).native();
}

bool isWithin(const std::string& path, const std::string& folder) {
  return path == folder || (path.starts_with(folder) && path[folder.size()] == '/');
}

// The document folder of an application that is listed.
bool isLibrary(const Session& session, const URL& url) {
  return session.libraries().shared().bundleProxyWithRootURL(url).has_value();
}

bool isWithinLibrary(const Session& session, const URL& url) {
  return isLibrary(session, url) || session.libraries().applicationOwning(url).has_value();
}

// The provider answers for every application that has a folder for documents, but nothing follows
// what lies in one that is not listed.
bool isShown(const Session& session, const LocalItem& item) {
  return !item.itemIdentifier().starts_with('#') || isLibrary(session, item.fileURL());
}

// The document storage may be named by a link to it, "~/Documents" for one, and so may the folder
// of an app library.
std::string withoutLinkToRoot(const Session& session, const std::string& path,
                              const std::string& storage) {
  std::error_code failure;
  const fs::path target = fs::canonical(path, failure);
  if (failure || target == path) return path;
  const bool isRoot = target == storage || isLibrary(session, URL::fileURL(target.native()));
  return isRoot ? target.native() : path;
}

}  // namespace

bool ItemArgument::isIdentifier() const {
  if (text_.find('/') != std::string::npos) return false;
  return text_ == rootWord || text_.starts_with("fid=") || text_.starts_with("did=") ||
         text_.starts_with('#') || text_ == VesselRootContainerItemIdentifier ||
         text_ == VesselTemporaryLocalFolderItemIdentifier;
}

Result<std::shared_ptr<LocalItem>> ItemArgument::item(const Session& session) const {
  return isIdentifier() ? itemByIdentifier(session) : itemAtPath(session, text_);
}

Result<URL> ItemArgument::urlOfPath(const std::string& path) {
  const auto place = resolved(path);
  if (!place) return fail(place.error());
  return URL::fileURL(*place);
}

Result<std::shared_ptr<LocalItem>> ItemArgument::itemByIdentifier(const Session& session) const {
  if (!hasForm(text_)) {
    return fail(withDetail(Error::local(LocalVesselError::invalidItemIdentifier),
                           "identifiers are fid=N, did=N and #bundle; a file of this name is "
                           "./" +
                               text_));
  }
  const std::string_view identifier = text_ == rootWord ? VesselRootContainerItemIdentifier : text_;
  auto item = session.provider().itemForIdentifier(identifier);
  if (item && isShown(session, **item)) return item;
  if (identifier.starts_with('#')) {
    auto reason = session.reasonLeftOut(identifier.substr(1));
    if (!reason && item) reason = "the application is there, but its documents are not shown";
    if (reason) {
      return fail(withDetail(Error::local(LocalVesselError::itemNotFound), *std::move(reason)));
    }
  }
  const URL& storage = session.platform().manager.documentStorageURL();
  const bool isRoot = identifier == VesselRootContainerItemIdentifier;
  if (isRoot && !session.platform().resources.readValues(storage)) {
    return fail(Error::posix(ENOENT, "the document storage \"" + storage.path() + "\""));
  }
  return fail(Error::nonExistentItem(identifier));
}

Result<std::shared_ptr<LocalItem>> ItemArgument::itemAtPath(const Session& session,
                                                            const std::string& path) {
  auto place = resolved(path);
  if (!place) return fail(place.error());
  const std::string& storage = session.platform().manager.documentStorageURL().path();
  place = withoutLinkToRoot(session, *place, storage);
  const URL url = URL::fileURL(*place);
  if (auto values = session.platform().resources.readValues(url); !values) {
    return fail(values.error());
  }
  const Error unknown = Error::local(LocalVesselError::itemNotFound);
  if (!isWithin(*place, storage) && !isWithinLibrary(session, url)) {
    return fail(withDetail(unknown, "it is not below the document storage \"" + storage +
                                        "\", nor in the folder of an app library"));
  }
  if (auto item = session.provider()._propertiesForItemAtURL(url)) return item;
  return fail(withDetail(unknown, "it is not shown as an item"));
}

}  // namespace mirabel
