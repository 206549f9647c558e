#include "linux/apps/EntryListing.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <functional>
#include <tuple>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/apps/ApplicationIdentifier.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

struct Folder {
  std::string relativePath;  // with "/" at its end, or empty
  unsigned depth;
};

// The directory itself may be a link; what is below it was seen to be a folder.
Result<UniqueFd> openFolder(const std::string& directory, const Folder& folder) {
  const int links = folder.depth == 0 ? 0 : O_NOFOLLOW;
  const std::string path = directory + "/" + folder.relativePath;
  const int fd = ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | links);
  if (fd < 0) return fail(Error::posix(errno));
  return UniqueFd(fd);
}

Result<bool> isFolder(int directory, const RawDirectory::Entry& entry) {
  if (entry.type != DT_UNKNOWN) return entry.type == DT_DIR;
  const auto status = statusAt(directory, std::string(entry.name));
  if (!status && saysOutOfReach(status.error())) return false;
  if (!status) return fail(status.error());
  return status->kind == FileKind::folder;
}

/// Goes through a directory and the folders below it.
class Walk {
 public:
  enum class Visit { goOn, stop };
  using EntryVisitor = std::function<Visit(const std::string& relativePath, bool isThere)>;
  using FolderVisitor = std::function<Visit(const Folder& folder)>;

  Walk(const std::string& directory, EntryVisitor onEntry, FolderVisitor onFolder)
      : directory_(directory), onEntry_(std::move(onEntry)), onFolder_(std::move(onFolder)) {}

  Result<void> run() {
    waiting_.push_back({"", 0});
    while (!waiting_.empty() && !isStopped_) {
      const Folder folder = std::move(waiting_.back());
      waiting_.pop_back();
      auto opened = openFolder(directory_, folder);
      if (!opened && saysOutOfReach(opened.error())) continue;
      if (!opened) return fail(opened.error());
      if (onFolder_(folder) == Visit::stop) break;
      if (auto done = read(RawDirectory(std::move(*opened)), folder); !done) return done;
    }
    return {};
  }

 private:
  Result<void> read(RawDirectory folder, const Folder& where) {
    while (!isStopped_) {
      const auto entry = folder.next();
      // A folder that was removed while it is read has no more entries.
      if (!entry && entry.error().isPosix(ENOENT)) return {};
      if (!entry) return fail(entry.error());
      if (!*entry) return {};
      const auto& name = (*entry)->name;
      if (name == "." || name == "..") continue;
      const std::string path = where.relativePath + std::string(name);
      const auto type = (*entry)->type;
      isStopped_ = onEntry_(path, type != DT_LNK && type != DT_UNKNOWN) == Visit::stop;
      if (where.depth == deepestEntryFolder || name.starts_with('.')) continue;
      const auto goesOn = isFolder(folder.descriptor(), **entry);
      if (!goesOn) return fail(goesOn.error());
      if (*goesOn) waiting_.push_back({path + "/", where.depth + 1});
    }
    return {};
  }

  const std::string& directory_;
  EntryVisitor onEntry_;
  FolderVisitor onFolder_;
  std::vector<Folder> waiting_;
  bool isStopped_ = false;
};

// Two paths may have one identifier.
std::vector<ListedEntry> inOrder(std::vector<ListedEntry> entries, LeftOutList& leftOut) {
  std::ranges::sort(entries, {}, [](const ListedEntry& entry) {
    return std::tie(entry.identifier, entry.relativePath);
  });
  std::vector<ListedEntry> result;
  result.reserve(entries.size());
  for (ListedEntry& entry : entries) {
    if (!result.empty() && result.back().identifier == entry.identifier) {
      leftOut.add(entry.identifier, "another entry of its directory has the same identifier");
    } else {
      result.push_back(std::move(entry));
    }
  }
  return result;
}

}  // namespace

Result<std::vector<ListedEntry>> listEntries(const std::string& directory, std::size_t mostEntries,
                                             LeftOutList& leftOut) {
  std::vector<ListedEntry> entries;
  std::vector<std::string> refused;
  std::size_t count = 0;
  const auto onEntry = [&](const std::string& path, bool isThere) {
    if (count++ == mostEntries) {
      leftOut.add(directory, "it has more entries than are read");
      return Walk::Visit::stop;
    }
    auto identifier = identifierOfEntry(path);
    if (!identifier) return Walk::Visit::goOn;
    if (isApplicationIdentifier(*identifier)) {
      entries.push_back({std::move(*identifier), path, isThere});
    } else {
      refused.push_back(std::move(*identifier));
    }
    return Walk::Visit::goOn;
  };
  const auto onFolder = [](const Folder&) { return Walk::Visit::goOn; };
  if (auto done = Walk(directory, onEntry, onFolder).run(); !done) return fail(done.error());
  std::ranges::sort(refused);
  for (const std::string& identifier : refused)
    leftOut.add(identifier, "its name can't be an identifier");
  return inOrder(std::move(entries), leftOut);
}

std::vector<std::string> foldersOfEntries(const std::string& directory, std::size_t most) {
  std::vector<std::string> folders;
  const auto onEntry = [](const std::string&, bool) { return Walk::Visit::goOn; };
  const auto onFolder = [&](const Folder& folder) {
    if (folders.size() == most) return Walk::Visit::stop;
    std::string path = directory + "/" + folder.relativePath;
    path.pop_back();
    folders.push_back(std::move(path));
    return Walk::Visit::goOn;
  };
  // What was found before a failure is worth having.
  static_cast<void>(Walk(directory, onEntry, onFolder).run());
  return folders;
}

}  // namespace mirabel
