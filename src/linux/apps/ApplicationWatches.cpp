#include "linux/apps/ApplicationWatches.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/ioctl.h>
#include <utility>

#include "linux/apps/ApplicationIdentifier.h"
#include "linux/apps/EntryListing.h"
#include "linux/kernel/ObjectStatus.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

constexpr std::string_view documentsName = "Documents";
constexpr std::size_t bufferSize = 1u << 16;
// Folders above one that is watched, which tell when it is replaced as a whole.
constexpr std::size_t foldersAbove = 2;

constexpr std::uint32_t madeBits = IN_CREATE | IN_MOVED_TO;
constexpr std::uint32_t changedBits = IN_CLOSE_WRITE | IN_ATTRIB;
constexpr std::uint32_t removedBits = IN_DELETE | IN_MOVED_FROM;
constexpr std::uint32_t ofFolderBits = IN_DELETE_SELF | IN_MOVE_SELF | IN_UNMOUNT | IN_IGNORED;
// The same for every folder: a second watch on one takes the place of the first.
constexpr std::uint32_t watchedBits =
    madeBits | changedBits | removedBits | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR;

// "/", "/a", "/a/b" for "/a/b".
std::vector<std::string> pathsTo(const std::string& target) {
  std::vector<std::string> paths{"/"};
  for (std::size_t end = target.find('/', 1); end != std::string::npos;
       end = target.find('/', end + 1)) {
    paths.push_back(target.substr(0, end));
  }
  if (target.size() > 1) paths.push_back(target);
  return paths;
}

std::string lastComponent(const std::string& path) {
  return path.substr(path.rfind('/') + 1);
}

// The number of the last of the paths that is there.
std::size_t deepestFolder(const std::vector<std::string>& paths) {
  for (std::size_t i = paths.size() - 1; i > 0; --i) {
    const auto status = statusOfTarget(paths[i]);
    if (status && status->kind == FileKind::folder) return i;
  }
  return 0;
}

}  // namespace

ApplicationWatches::ApplicationWatches(ApplicationPlaces places, Bounds bounds)
    : places_(std::move(places)), bounds_(bounds) {}

// --- watching ------------------------------------------------------------------------------------

void ApplicationWatches::arm() {
  // The former instance is there until the new one watches.
  UniqueFd former = std::exchange(instance_, UniqueFd(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC)));
  watched_.clear();
  containers_ = 0;
  mustRearm_ = false;
  isComplete_ = instance_.isOpen();
  if (!isComplete_) return;
  for (const std::string& directory : places_.directories) {
    watchChain(directory, Role::entries);
    watchFoldersOfEntries(directory, 0);
  }
  watchChain(places_.containers, Role::containers);
  watchContainers();
}

// From above: a folder that is made meanwhile is told of by the one above it.
void ApplicationWatches::watchChain(const std::string& target, Role role) {
  const std::vector<std::string> paths = pathsTo(target);
  const std::size_t deepest = deepestFolder(paths);
  for (std::size_t i = deepest - std::min(deepest, foldersAbove); i < paths.size(); ++i) {
    const bool isTarget = i + 1 == paths.size();
    Watched folder{isTarget ? role : Role::above, paths[i]};
    if (!isTarget) folder.awaited = lastComponent(paths[i + 1]);
    // One that may be passed and not read does not end the way.
    if (add(std::move(folder)) < 0 && errno != EACCES) return;
  }
}

void ApplicationWatches::watchFoldersOfEntries(const std::string& directory, unsigned depth) {
  const std::vector<std::string> folders = foldersOfEntries(directory, bounds_.foldersOfEntries);
  const auto slashes = [](const std::string& path) { return std::ranges::count(path, '/'); };
  for (const std::string& folder : folders) {
    const auto below = static_cast<unsigned>(slashes(folder) - slashes(directory));
    if (depth + below == 0 || depth + below > deepestEntryFolder) continue;
    add({Role::entries, folder, {}, depth + below});
  }
}

void ApplicationWatches::watchContainers() {
  UniqueFd opened(::open(places_.containers.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!opened) return;
  RawDirectory folder(std::move(opened));
  while (isComplete_) {
    const auto entry = folder.next();
    if (!entry || !*entry) return;
    const bool mayBeFolder = (*entry)->type == DT_DIR || (*entry)->type == DT_UNKNOWN;
    if (!mayBeFolder || (*entry)->name.starts_with('.')) continue;
    add({Role::container, places_.containers + "/" + std::string((*entry)->name)});
  }
}

int ApplicationWatches::add(Watched folder) {
  const bool isContainer = folder.role == Role::container;
  const std::uint32_t mask = watchedBits | (isContainer ? IN_DONT_FOLLOW : 0u);
  const bool hasRoom =
      watched_.size() < bounds_.watches && (!isContainer || containers_ < bounds_.containers);
  if (!hasRoom) errno = ENOSPC;
  const int watch = hasRoom ? ::inotify_add_watch(instance_.get(), folder.path.c_str(), mask) : -1;
  if (watch >= 0) {
    note(watch, std::move(folder));
  } else if (errno == ENOSPC || errno == ENOMEM) {
    isComplete_ = false;
  }
  return watch;
}

void ApplicationWatches::note(int watch, Watched folder) {
  std::vector<Watched>& reasons = watched_[watch];
  const auto same = std::ranges::find_if(reasons, [&](const Watched& known) {
    return known.role == folder.role && known.awaited == folder.awaited;
  });
  if (same != reasons.end()) {
    *same = std::move(folder);
    return;
  }
  if (folder.role == Role::container) ++containers_;
  reasons.push_back(std::move(folder));
}

// --- hearing -------------------------------------------------------------------------------------

ApplicationWatches::Changes ApplicationWatches::drain() {
  Changes changes;
  // What is there now: a busy writer must not keep this from ending.
  int queued = 0;
  if (::ioctl(instance_.get(), FIONREAD, &queued) != 0) return changes;
  alignas(inotify_event) std::array<char, bufferSize> buffer;
  while (queued > 0) {
    const ssize_t count = ::read(instance_.get(), buffer.data(), buffer.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) break;
    queued -= static_cast<int>(count);
    for (ssize_t at = 0; at < count;) {
      inotify_event event;
      std::memcpy(&event, buffer.data() + at, sizeof(event));
      const char* name = buffer.data() + at + sizeof(event);
      take({event.wd, event.mask, {name, ::strnlen(name, event.len)}}, changes);
      at += static_cast<ssize_t>(sizeof(event) + event.len);
    }
  }
  if (mustRearm_) arm();
  return changes;
}

void ApplicationWatches::take(const Record& record, Changes& changes) {
  if (record.isAnyOf(IN_Q_OVERFLOW)) {
    changes = {true, true};
    mustRearm_ = true;
    return;
  }
  if (record.isAnyOf(ofFolderBits)) return takeOfFolder(record, changes);
  const auto found = watched_.find(record.watch);
  if (found == watched_.end()) return;
  // A copy: what is found here may be watched in turn.
  for (const Watched& folder : std::vector<Watched>(found->second))
    takeInFolder(folder, record, changes);
}

// Something happened to a folder that is watched.
void ApplicationWatches::takeOfFolder(const Record& record, Changes& changes) {
  const auto found = watched_.find(record.watch);
  if (found == watched_.end()) return;
  const bool isContainer = std::ranges::all_of(
      found->second, [](const Watched& folder) { return folder.role == Role::container; });
  if (!isContainer) {
    // What lay below it may be elsewhere too.
    changes = {true, true};
    mustRearm_ = true;
  } else if (record.isAnyOf(IN_IGNORED)) {
    containers_ -= std::min(containers_, found->second.size());
    watched_.erase(found);
  } else if (record.isAnyOf(IN_MOVE_SELF)) {
    // The folder that holds it has told of that. It may have moved within there, and then its new
    // name is known by now.
    const Watched folder = found->second.front();
    if (add(folder) != record.watch) ::inotify_rm_watch(instance_.get(), record.watch);
  }
}

bool ApplicationWatches::counts(const Watched& folder, const Record& record) const {
  switch (folder.role) {
    case Role::above:
      return record.name == folder.awaited;
    case Role::entries:
      return record.name.ends_with(desktopEntrySuffix) || record.isAnyOf(IN_ISDIR);
    case Role::containers:
      return record.isAnyOf(IN_ISDIR) && !record.name.starts_with('.');
    case Role::container:
      return record.name == documentsName;
  }
  return false;
}

void ApplicationWatches::takeInFolder(const Watched& folder, const Record& record,
                                      Changes& changes) {
  // The folder itself: it may have become readable, or may be no longer.
  if (record.name.empty()) {
    changes.registered = changes.registered || folder.role != Role::above;
    mustRearm_ = mustRearm_ || folder.role == Role::entries || folder.role == Role::containers;
    return;
  }
  if (!counts(folder, record)) return;
  if (record.isAnyOf(madeBits | changedBits)) changes.registered = true;
  if (record.isAnyOf(removedBits)) changes.unregistered = true;
  if (record.isAnyOf(madeBits | IN_ATTRIB)) extend(folder, record);
  if (folder.role == Role::above) mustRearm_ = true;
}

// Watches what is new.
void ApplicationWatches::extend(const Watched& folder, const Record& record) {
  if (!record.isAnyOf(IN_ISDIR)) return;
  const std::string path = folder.path + "/" + std::string(record.name);
  if (folder.role == Role::containers) add({Role::container, path});
  if (folder.role != Role::entries || folder.depth >= deepestEntryFolder) return;
  add({Role::entries, path, {}, folder.depth + 1});
  watchFoldersOfEntries(path, folder.depth + 1);
}

}  // namespace mirabel
