#include "host/search/SearchFiles.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace mirabel {
namespace {

constexpr const char* database = "search.db";
constexpr const char* databaseLog = "search.db-wal";
constexpr const char* newDatabase = "search.db.new";
constexpr const char* newDatabaseLog = "search.db.new-wal";

}  // namespace

Result<SearchFiles> SearchFiles::open(const std::string& folder) {
  UniqueFd descriptor(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!descriptor) return fail(Error::posix(errno, folder));
  SearchFiles files(folder, std::move(descriptor));
  files.removeNew();
  // A log of a database that is gone must not be taken for that of the next.
  if (files.sizeOf(database) < 0) files.remove();
  return files;
}

std::int64_t SearchFiles::sizeOf(const char* name) const {
  struct stat status {};
  if (::fstatat(descriptor_.get(), name, &status, AT_SYMLINK_NOFOLLOW) != 0) return -1;
  return status.st_size;
}

Result<void> SearchFiles::make(const char* name) const {
  // SQLite gives its log the mode of the database.
  const auto open = [&] {
    const int flags = O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;
    return UniqueFd(::openat(descriptor_.get(), name, flags, 0600));
  };
  UniqueFd made = open();
  // A link or a FIFO is nothing that was put there to be kept.
  if (!made && (errno == ELOOP || errno == ENXIO)) {
    ::unlinkat(descriptor_.get(), name, 0);
    made = open();
  }
  if (!made) return fail(Error::posix(errno, folder_ + "/" + name));
  return {};
}

Result<void> SearchFiles::make() const {
  return make(database);
}

Result<void> SearchFiles::makeNew() const {
  removeNew();
  return make(newDatabase);
}

void SearchFiles::remove() const {
  ::unlinkat(descriptor_.get(), database, 0);
  ::unlinkat(descriptor_.get(), databaseLog, 0);
}

void SearchFiles::removeNew() const {
  ::unlinkat(descriptor_.get(), newDatabase, 0);
  ::unlinkat(descriptor_.get(), newDatabaseLog, 0);
}

Result<void> SearchFiles::synchronizeNew() const {
  const UniqueFd made(::openat(descriptor_.get(), newDatabase, O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  if (!made || ::fsync(made.get()) != 0) return fail(Error::posix(errno, newPath()));
  return {};
}

Result<void> SearchFiles::replaceByNew() const {
  // Nothing of the former log may be on disk once the new database has its name. A database that
  // needs its log was not closed in order, because it is damaged.
  if (sizeOf(databaseLog) > 0) ::unlinkat(descriptor_.get(), database, 0);
  ::unlinkat(descriptor_.get(), databaseLog, 0);
  if (auto removed = synchronize(); !removed) return removed;
  const int folder = descriptor_.get();
  if (::renameat(folder, newDatabase, folder, database) != 0) {
    return fail(Error::posix(errno, path()));
  }
  ::unlinkat(folder, newDatabaseLog, 0);
  return synchronize();
}

Result<void> SearchFiles::synchronize() const {
  if (::fsync(descriptor_.get()) != 0) return fail(Error::posix(errno, folder_));
  return {};
}

}  // namespace mirabel
