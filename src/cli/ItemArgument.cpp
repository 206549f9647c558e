#include "cli/ItemArgument.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <system_error>

#include "cli/Printing.h"

namespace mirabel {
namespace {

std::optional<std::string_view> identifierOfWord(std::string_view word) {
  if (word == "root") return VesselRootContainerItemIdentifier;
  if (word == "workingset") return VesselWorkingSetContainerItemIdentifier;
  if (word == "alldirs") return VesselAllDirectoriesContainerItemIdentifier;
  return std::nullopt;
}

Error outside(std::string_view path) {
  Error error = Error::local(LocalVesselError::itemNotFound);
  error.userInfo[std::string(errorkey::detail)] =
      "\"" + std::string(path) + "\" is not among the documents";
  return error;
}

}  // namespace

bool ItemArgument::isIdentifier() const {
  return identifierOfWord(text_) || text_.starts_with("fid=") || text_.starts_with("did=") ||
         text_.starts_with('#') || text_ == VesselRootContainerItemIdentifier ||
         text_ == VesselTemporaryLocalFolderItemIdentifier;
}

Result<URL> ItemArgument::url(const std::string& path) {
  if (path.empty()) return fail(Error::posix(ENOENT, "an empty path"));
  std::error_code failure;
  std::filesystem::path absolute = std::filesystem::absolute(path, failure);
  if (failure) return fail(Error::posix(failure.value(), path));
  if (!absolute.has_filename()) absolute = absolute.parent_path();
  const std::filesystem::path name = absolute.filename();
  if (name == "." || name == ".." || absolute == absolute.root_path()) {
    const auto resolved = std::filesystem::canonical(absolute, failure);
    if (failure) return fail(Error::posix(failure.value(), path));
    return URL::fileURL(resolved.native());
  }
  // A path longer than the kernel takes in one go can't be resolved; it stands as it is.
  if (absolute.native().size() >= PATH_MAX) return URL::fileURL(absolute.native());
  const auto parent = std::filesystem::canonical(absolute.parent_path(), failure);
  if (failure) return fail(Error::posix(failure.value(), path));
  return URL::fileURL((parent / name).native());
}

Result<std::shared_ptr<LocalItem>> ItemArgument::item(const Session& session) const {
  const LocalVessel& provider = session.provider();
  if (isIdentifier()) {
    const auto word = identifierOfWord(text_);
    auto item = provider.itemForIdentifier(word ? *word : std::string_view(text_));
    if (!item) return fail(Error::nonExistentItem(text_));
    return item;
  }
  auto place = url(text_);
  if (!place) return fail(place.error());
  // The document storage may be named by a link, "~/Documents" for one.
  std::error_code failure;
  const auto resolved = std::filesystem::canonical(place->path(), failure);
  const URL& storage = session.platform().manager.documentStorageURL();
  if (!failure && resolved.native() == storage.path()) place = storage;
  if (auto values = session.platform().resources.readValues(*place); !values) {
    Error error = values.error();
    error.userInfo.try_emplace(std::string(errorkey::detail), text_);
    return fail(std::move(error));
  }
  auto item = provider._propertiesForItemAtURL(*place);
  if (!item) return fail(outside(text_));
  return item;
}

Result<std::string> ItemArgument::identifier(const Session& session) const {
  auto found = item(session);
  if (!found) return fail(found.error());
  return (*found)->itemIdentifier();
}

}  // namespace mirabel
