#include "host/ItemFile.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>

#include "linux/kernel/LongPath.h"

namespace mirabel {
namespace {

constexpr int mostTries = 5;
constexpr unsigned long long withoutLinks = RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;

Result<std::string> pathOf(const ItemLookup& lookup, std::string_view identifier) {
  const auto item = lookup.byIdentifier(identifier);
  if (!item) return fail(item.error());
  return (*item)->fileURL().path();
}

Result<void> requireRegularFile(const struct stat& status) {
  if (S_ISREG(status.st_mode)) return {};
  return fail(Error::posix(S_ISDIR(status.st_mode) ? EISDIR : ENOTSUP));
}

bool isSameFile(const struct stat& one, const struct stat& other) {
  return one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

Result<struct stat> statusAt(const std::string& path) {
  const auto place = openLongPath(AT_FDCWD, path, O_PATH, withoutLinks);
  struct stat status {};
  if (!place) return fail(place.error());
  if (::fstat(place->get(), &status) != 0) return fail(Error::posix(errno));
  return status;
}

}  // namespace

Result<UniqueFd> openItemFile(const ItemLookup& lookup, std::string_view identifier,
                              Documents::Access access) {
  const int mode = access == Documents::Access::reading ? O_RDONLY : O_RDWR;
  for (int tries = 0; tries < mostTries; ++tries) {
    const auto path = pathOf(lookup, identifier);
    if (!path) return fail(path.error());
    // Before anything else is done with it: opening a device or a pipe may have effects.
    const auto before = statusAt(*path);
    if (!before) continue;
    if (auto regular = requireRegularFile(*before); !regular) return fail(regular.error());
    auto file = openLongPath(AT_FDCWD, *path, mode | O_NONBLOCK | O_NOCTTY, withoutLinks);
    if (!file && !file.error().isPosix(ENOENT)) return fail(file.error());
    if (!file) continue;
    struct stat opened {};
    if (::fstat(file->get(), &opened) != 0) return fail(Error::posix(errno));
    if (auto regular = requireRegularFile(opened); !regular) return fail(regular.error());
    const auto pathNow = pathOf(lookup, identifier);
    if (!pathNow) return fail(pathNow.error());
    const auto now = statusAt(*pathNow);
    if (!now || !isSameFile(opened, *now)) continue;
    ::fcntl(file->get(), F_SETFL, 0);
    return std::move(*file);
  }
  return fail(Error::posix(EBUSY, "the file is being replaced"));
}

}  // namespace mirabel
