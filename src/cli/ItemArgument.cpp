#include "cli/ItemArgument.h"

#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdint>
#include <filesystem>
#include <system_error>

#include "platform/VesselManager.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view rootWord = "root";

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

}  // namespace

bool ItemArgument::isIdentifier() const {
  if (text_.find('/') != std::string::npos) return false;
  return text_ == rootWord || text_.starts_with("fid=") || text_.starts_with("did=") ||
         text_.starts_with('#') || text_ == VesselRootContainerItemIdentifier ||
         text_ == VesselTemporaryLocalFolderItemIdentifier;
}

Result<ItemRecord> ItemArgument::item(Documents& documents) const {
  return isIdentifier() ? itemByIdentifier(documents) : itemAtPath(documents, text_);
}

Result<std::string> ItemArgument::resolvedPath(const std::string& path) {
  return resolved(path);
}

Result<ItemRecord> ItemArgument::itemByIdentifier(Documents& documents) const {
  if (!hasForm(text_)) {
    Error error = Error::local(LocalVesselError::invalidItemIdentifier);
    error.userInfo[std::string(errorkey::detail)] =
        "identifiers are fid=N, did=N and #bundle; a file of this name is ./" + text_;
    return fail(std::move(error));
  }
  return documents.item(text_ == rootWord ? VesselRootContainerItemIdentifier : text_);
}

Result<ItemRecord> ItemArgument::itemAtPath(Documents& documents, const std::string& path) {
  const auto place = resolved(path);
  if (!place) return fail(place.error());
  return documents.itemAtPath(*place);
}

}  // namespace mirabel
