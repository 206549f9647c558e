#include "linux/volume/FollowedFolders.h"

#include <limits>
#include <utility>

namespace mirabel {

Result<void> FollowedFolders::load() {
  auto folders = database_.prepare("SELECT path, label FROM followed_folders");
  if (!folders) return fail(folders.error());
  for (auto row = folders->step(); !row || *row; row = folders->step()) {
    if (!row) return fail(row.error());
    folders_.emplace(folders->blob(0), folders->blob(1));
  }
  auto versions = database_.prepare("SELECT version, event FROM followed_versions");
  if (!versions) return fail(versions.error());
  for (auto row = versions->step(); !row || *row; row = versions->step()) {
    if (!row) return fail(row.error());
    versions_.emplace(versions->unsignedInteger(0), versions->unsignedInteger(1));
  }
  return {};
}

std::vector<std::string> FollowedFolders::paths() const {
  std::vector<std::string> paths;
  paths.reserve(folders_.size());
  for (const auto& [path, label] : folders_)
    paths.push_back(path);
  return paths;
}

bool FollowedFolders::isKnown(std::uint64_t version) const {
  return !versions_.empty() && versions_.rbegin()->first >= version;
}

FollowedFolders::Difference FollowedFolders::differenceTo(
    const std::vector<FollowedFolder>& folders, std::uint64_t version) const {
  Difference difference;
  difference.isNewVersion = version != 0 && !isKnown(version);
  std::map<std::string_view, bool> named;
  for (const FollowedFolder& folder : folders) {
    named.emplace(folder.path, true);
    const auto known = folders_.find(folder.path);
    if (known == folders_.end()) {
      difference.come.push_back(folder.path);
    } else if (known->second != folder.label) {
      difference.relabelled.push_back(folder.path);
    }
  }
  for (const auto& [path, label] : folders_) {
    if (!named.contains(path)) difference.gone.push_back(path);
  }
  return difference;
}

Result<void> FollowedFolders::store(const std::vector<FollowedFolder>& folders,
                                    std::uint64_t version, std::uint64_t lastEvent) {
  const Difference difference = differenceTo(folders, version);
  auto remove = database_.prepare("DELETE FROM followed_folders WHERE path = ?1");
  if (!remove) return fail(remove.error());
  for (const std::string& path : difference.gone) {
    if (auto removed = remove->bindBlob(1, path).run(); !removed) return removed;
  }
  auto put =
      database_.prepare("INSERT OR REPLACE INTO followed_folders(path, label) VALUES(?1,?2)");
  if (!put) return fail(put.error());
  for (const FollowedFolder& folder : folders) {
    const auto known = folders_.find(folder.path);
    if (known != folders_.end() && known->second == folder.label) continue;
    auto written = put->bindBlob(1, folder.path).bindBlob(2, folder.label).run();
    if (!written) return written;
  }
  if (!difference.isNewVersion) return {};
  auto note = database_.prepare("INSERT INTO followed_versions(version, event) VALUES(?1,?2)");
  if (!note) return fail(note.error());
  if (auto noted = note->bind(1, version).bind(2, lastEvent).run(); !noted) return noted;
  if (versions_.size() < mostVersions) return {};
  auto forget = database_.prepare("DELETE FROM followed_versions WHERE version = ?1");
  if (!forget) return fail(forget.error());
  return forget->bind(1, versions_.begin()->first).run();
}

void FollowedFolders::adopt(const std::vector<FollowedFolder>& folders, std::uint64_t version,
                            std::uint64_t lastEvent) {
  const bool isNewVersion = differenceTo(folders, version).isNewVersion;
  folders_.clear();
  for (const FollowedFolder& folder : folders)
    folders_.emplace(folder.path, folder.label);
  if (!isNewVersion) return;
  if (versions_.size() >= mostVersions) versions_.erase(versions_.begin());
  versions_.emplace(version, lastEvent);
}

std::uint64_t FollowedFolders::lastEventUnder(std::uint64_t version) const {
  const auto later = versions_.upper_bound(version);
  if (later == versions_.end()) return std::numeric_limits<std::uint64_t>::max();
  // Versions before the oldest that is known may have been forgotten.
  const bool isSure = later != versions_.begin() || versions_.size() < mostVersions;
  return isSure ? later->second : 0;
}

}  // namespace mirabel
