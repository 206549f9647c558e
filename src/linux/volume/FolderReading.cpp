#include "linux/volume/FolderReading.h"

#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "foundation/LookFailure.h"
#include "foundation/SplitWork.h"
#include "linux/volume/IndexContext.h"

namespace mirabel {
namespace {

constexpr std::size_t pieceSize = 64;

bool isDots(std::string_view name) {
  return name == "." || name == "..";
}

Result<void> readNames(FolderReading& reading) {
  reading.entries.clear();
  while (reading.directory && reading.entries.size() < entriesPerTransaction) {
    auto entry = reading.directory->next();
    if (!entry) return fail(entry.error());
    if (!*entry) reading.directory.reset();
    if (!*entry || isDots((*entry)->name)) continue;
    reading.entries.push_back({std::string((*entry)->name), {}, false});
  }
  return {};
}

}  // namespace

Result<FolderReading> beginReading(UniqueFd folder) {
  // Open anew, now that it is watched: btrfs gives what was there when a folder was opened, and
  // what came between that and the mark would be in neither.
  UniqueFd reading(::openat(folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!reading) return fail(Error::posix(errno));
  auto status = statusAt(folder.get(), "");
  if (!status) return fail(status.error());
  return FolderReading{std::move(folder), *status, RawDirectory(std::move(reading))};
}

Result<void> readNext(FolderReading& reading) {
  if (auto named = readNames(reading); !named) return named;
  std::vector<Sighting>& entries = reading.entries;
  std::vector<int> failures(entries.size(), 0);
  splitWork(entries.size(), pieceSize, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      auto status = statusAt(reading.folder.get(), entries[i].name);
      if (!status) failures[i] = static_cast<int>(status.error().code);
      if (status) entries[i].status = *status;
    }
  });
  std::size_t kept = 0;
  for (std::size_t i = 0; i < entries.size(); ++i) {
    if (failures[i] != 0) {
      const Error error = Error::posix(failures[i], entries[i].name);
      if (!saysOutOfReach(error)) return fail(error);
      if (error.isPosix(EXDEV)) ++reading.deadMounts;
      continue;
    }
    if (kept != i) entries[kept] = std::move(entries[i]);
    ++kept;
  }
  entries.resize(kept);
  return {};
}

}  // namespace mirabel
