#include "linux/apps/ContainerFolders.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/kernel/ClosedFolders.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

constexpr std::string_view documentsSuffix = "/Documents";
constexpr std::string_view throughLink = "its documents are reached through a symbolic link";
constexpr std::string_view noFolder = "its documents are in no folder";
constexpr std::string_view unreachable = "its documents can't be reached";
constexpr std::string_view elsewhere = "its documents are on another volume";

// A mount is not refused here: on which file system it leads to is what counts.
constexpr unsigned long long resolve =
    RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
constexpr int folderFlags = O_PATH | O_DIRECTORY;

// Why `path` could not be opened; empty where nothing is there.
std::string_view reasonFor(const Error& error, int directory, std::string_view path) {
  if (error.isPosix(ENOENT)) return {};
  if (error.isPosix(ELOOP)) return throughLink;
  if (!error.isPosix(ENOTDIR)) return unreachable;
  // A link in place of the folder looks the same to the kernel as a file.
  const auto status = statusAt(directory, std::string(path));
  return status && status->kind == FileKind::symbolicLink ? throughLink : noFolder;
}

// Whether a mount that is dead is on the way to `path`, or at its beginning or end.
bool leadsToDeadMount(int directory, std::string_view path) {
  for (std::size_t end = 0; end <= path.size();
       end = std::min(path.find('/', end + 1), path.size())) {
    const auto status = statusAt(directory, std::string(path.substr(0, end)));
    if (!status && status.error().isPosix(EXDEV)) return true;
    if (end == path.size()) break;
  }
  return false;
}

// After the failure to reach `path`: whether nothing may be concluded from it.
bool isPassing(const Error& error, int directory, std::string_view path) {
  return !saysOutOfReach(error) && !leadsToDeadMount(directory, path);
}

}  // namespace

ContainerFolders::ContainerFolders(const std::string& home, std::uint64_t device)
    : home_(home),
      prefix_(URL::fileURL(home).appendingPathComponent(pathInHome).path() + "/"),
      canonical_(URL::fileURL(prefix_).properURL().path() + "/"),
      device_(device) {}

Result<ContainerFolders::Opened> ContainerFolders::open() const {
  Opened opened;
  opened.device_ = device_;
  const auto home = openLongPath(AT_FDCWD, home_, folderFlags);
  auto folder = home ? openLongPath(home->get(), std::string(pathInHome), folderFlags, resolve)
                     : Result<UniqueFd>(fail(home.error()));
  if (folder) {
    opened.folder_ = std::move(*folder);
    return opened;
  }
  if (!home && !saysOutOfReach(home.error())) return fail(home.error());
  if (home && isPassing(folder.error(), home->get(), pathInHome)) return fail(folder.error());
  if (home) opened.reason_ = reasonFor(folder.error(), home->get(), pathInHome);
  return opened;
}

Result<ContainerFolders::Look> ContainerFolders::Opened::look(const std::string& identifier) const {
  if (!folder_) return Look{};
  const std::string path = identifier + std::string(documentsSuffix);
  const auto documents = openLongPath(folder_.get(), path, folderFlags, resolve);
  if (!documents) {
    if (isPassing(documents.error(), folder_.get(), path)) return fail(documents.error());
    return Look{.reason = reasonFor(documents.error(), folder_.get(), path)};
  }
  const auto status = statusAt(documents->get(), "");
  if (!status && !saysOutOfReach(status.error())) return fail(status.error());
  if (!status) return Look{.reason = unreachable};
  if (status->device != device_) return Look{.reason = elsewhere};
  if (isClosed(documents->get())) return Look{.reason = unreachable};
  return Look{.hasDocuments = true, .inode = status->inode};
}

URL ContainerFolders::containerOf(std::string_view identifier) const {
  // Made anew: what was read of a folder above it must not outlive a change.
  return URL::fileURL(prefix_ + std::string(identifier));
}

std::string ContainerFolders::identifierAt(const URL& url) const {
  const URL canonical = url.properURL();
  std::string_view path = canonical.path();
  if (!path.starts_with(canonical_) || !path.ends_with(documentsSuffix)) return {};
  path.remove_prefix(canonical_.size());
  if (path.size() <= documentsSuffix.size()) return {};
  path.remove_suffix(documentsSuffix.size());
  return std::string(path);
}

}  // namespace mirabel
