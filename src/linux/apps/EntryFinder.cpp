#include "linux/apps/EntryFinder.h"

#include <utility>

#include "linux/apps/ApplicationIdentifier.h"

namespace mirabel {

EntryFinder::EntryFinder(std::vector<std::string> directories, EntryReader& reader,
                         std::size_t mostDirectoryEntries)
    : directories_(std::move(directories)),
      reader_(reader),
      mostDirectoryEntries_(mostDirectoryEntries),
      inFolders_(directories_.size()) {}

Result<std::vector<ListedEntry>> EntryFinder::list(std::size_t directory, LeftOutList& leftOut) {
  auto entries = listEntries(directories_[directory], mostDirectoryEntries_, leftOut);
  if (!entries) return entries;
  Paths paths;
  for (const ListedEntry& entry : *entries) {
    const bool isInFolder = entry.relativePath.find('/') != std::string::npos;
    if (isInFolder) paths.emplace(entry.identifier, entry.relativePath);
  }
  const std::lock_guard lock(mutex_);
  inFolders_[directory] = std::move(paths);
  return entries;
}

Result<EntryReading> EntryFinder::find(const std::string& identifier) {
  for (std::size_t i = 0; i < directories_.size(); ++i) {
    auto reading = findIn(i, identifier);
    if (!reading || !reading->isAbsent()) return reading;
  }
  return EntryReading{};
}

Result<EntryReading> EntryFinder::findIn(std::size_t directory, const std::string& identifier) {
  const std::string folder = directories_[directory] + "/";
  auto reading = reader_.read(folder + identifier + std::string(desktopEntrySuffix));
  // An entry in a folder has a "-" for each "/" of its path.
  if (!reading || !reading->isAbsent() || identifier.find('-') == std::string::npos) return reading;
  const auto path = pathInFolders(directory, identifier);
  if (!path) return fail(path.error());
  return *path ? reader_.read(folder + **path) : reading;
}

Result<std::optional<std::string>> EntryFinder::pathInFolders(std::size_t directory,
                                                              const std::string& identifier) {
  std::unique_lock lock(mutex_);
  if (!inFolders_[directory]) {
    lock.unlock();
    LeftOutList ignored;
    if (const auto listed = list(directory, ignored); !listed) return fail(listed.error());
    lock.lock();
  }
  const Paths& paths = *inFolders_[directory];
  const auto found = paths.find(identifier);
  return found == paths.end() ? std::nullopt : std::optional(found->second);
}

}  // namespace mirabel
