#include "linux/volume/DatabaseFiles.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>

#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

constexpr off_t userVersionOffset = 60;  // big endian, as SQLite's file format has it

}  // namespace

bool DatabaseFiles::has(std::string_view name) const {
  return statusAt(folder_.descriptor(), std::string(name)).has_value();
}

Result<void> DatabaseFiles::make() const {
  // SQLite gives its log the mode of the database.
  const UniqueFd made(::openat(folder_.descriptor(), "volume.db",
                               O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!made) return fail(Error::posix(errno, path()));
  return {};
}

std::optional<DatabaseFiles::Stamp> DatabaseFiles::stamp() const {
  const auto status = statusAt(folder_.descriptor(), "volume.db");
  if (!status) return std::nullopt;
  return Stamp{status->size, status->modificationTime};
}

std::uint32_t DatabaseFiles::userVersion() const {
  const UniqueFd file(
      ::openat(folder_.descriptor(), "volume.db", O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  std::array<unsigned char, 4> bytes{};
  if (!file || ::pread(file.get(), bytes.data(), bytes.size(), userVersionOffset) != 4) return 0;
  std::uint32_t version = 0;
  for (const unsigned char byte : bytes)
    version = version << 8 | byte;
  return version;
}

void DatabaseFiles::markAsDamaged() const {
  const UniqueFd mark(
      ::openat(folder_.descriptor(), "damaged", O_WRONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
}

Result<std::string> DatabaseFiles::setAside() const {
  int number = 1;
  while (has("volume.db.damaged-" + std::to_string(number)))
    ++number;
  const std::string aside = "volume.db.damaged-" + std::to_string(number);
  const int directory = folder_.descriptor();
  for (const char* suffix : {"-wal", "-shm", ""}) {
    const std::string from = std::string("volume.db") + suffix;
    if (!has(from)) continue;
    if (::renameat(directory, from.c_str(), directory, (aside + suffix).c_str()) != 0) {
      return fail(Error::posix(errno, folder_.file(from)));
    }
  }
  ::unlinkat(directory, "damaged", 0);
  return folder_.file(aside);
}

}  // namespace mirabel
