#include "linux/watch/FanotifyWatcher.h"

#include <cerrno>
#include <fcntl.h>
#include <span>
#include <sys/fanotify.h>
#include <sys/ioctl.h>
#include <utility>

#include "linux/kernel/ObjectStatus.h"
#include "linux/watch/FanotifyRecords.h"

namespace mirabel {
namespace {

constexpr std::size_t bufferSize = 1u << 18;

// The queue keeps its limit for the administrator too: a reader that was stopped must not fill the
// kernel's memory, and comparing with the disk makes good what was lost.
constexpr unsigned groupFlags = FAN_CLASS_NOTIF | FAN_CLOEXEC | FAN_NONBLOCK |
                                FAN_REPORT_DFID_NAME | FAN_REPORT_FID | FAN_REPORT_TARGET_FID;
constexpr std::uint64_t everything = FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY |
                                     FAN_ATTRIB | FAN_CLOSE_WRITE | FAN_DELETE_SELF | FAN_ONDIR;

}  // namespace

Result<std::unique_ptr<FolderWatcher>> FanotifyWatcher::create(WatcherKind kind) {
  UniqueFd group(::fanotify_init(groupFlags, O_RDONLY | O_CLOEXEC));
  if (!group) return fail(Error::posix(errno));
  return std::unique_ptr<FolderWatcher>(new FanotifyWatcher(std::move(group), kind));
}

FanotifyWatcher::FanotifyWatcher(UniqueFd group, WatcherKind kind)
    : group_(std::move(group)),
      kind_(kind),
      buffer_(std::make_unique_for_overwrite<std::byte[]>(bufferSize)) {}

Result<void> FanotifyWatcher::watch(int folder, std::uint64_t id) {
  auto handle = handleAt(folder, "");
  if (!handle) return fail(Error::posix(EOPNOTSUPP));
  // Marked first: what is known to be watched is heard of.
  auto marked = mark(folder);
  if (marked) {
    closed_.remove(id);
    marked_.add(std::move(*handle), id);
  } else if (marked.error().isPosix(EACCES) && !isWatched(id)) {
    closed_.add(std::move(*handle), id);
  }
  return marked;
}

void FanotifyWatcher::Folders::add(std::string handle, std::uint64_t id) {
  if (const auto known = handles.find(id); known != handles.end()) {
    if (*known->second == handle) return;
    numbers.erase(numbers.find(*known->second));
  }
  const auto [entry, isNew] = numbers.try_emplace(std::move(handle), id);
  if (!isNew) handles.erase(std::exchange(entry->second, id));
  handles[id] = &entry->first;
}

void FanotifyWatcher::Folders::remove(std::uint64_t id) {
  const auto known = handles.find(id);
  if (known == handles.end()) return;
  numbers.erase(numbers.find(*known->second));
  handles.erase(known);
}

Result<void> FanotifyWatcher::mark(int folder) {
  const bool isWhole = kind_ == WatcherKind::fileSystemMark;
  if (isWhole && hasFileSystemMark_) return {};
  const unsigned flags = FAN_MARK_ADD | (isWhole ? FAN_MARK_FILESYSTEM : FAN_MARK_ONLYDIR);
  const std::uint64_t mask = everything | (isWhole ? 0 : FAN_EVENT_ON_CHILD);
  if (::fanotify_mark(group_.get(), flags, mask, folder, ".") != 0) {
    return fail(Error::posix(errno));
  }
  hasFileSystemMark_ = isWhole;
  return {};
}

bool FanotifyWatcher::isWatched(std::uint64_t id) const {
  return marked_.handles.contains(id);
}

std::size_t FanotifyWatcher::watchedFolders() const {
  return marked_.handles.size();
}

void FanotifyWatcher::forget(std::uint64_t id) {
  marked_.remove(id);
  closed_.remove(id);
}

std::optional<std::uint64_t> FanotifyWatcher::numberOf(std::string_view handle) const {
  for (const Numbers* numbers : {&marked_.numbers, &closed_.numbers}) {
    const auto folder = numbers->find(handle);
    if (folder != numbers->end()) return folder->second;
  }
  return std::nullopt;
}

Result<FolderWatcher::Drained> FanotifyWatcher::drain(LookList& looks) {
  Drained drained;
  int queued = 0;
  if (::ioctl(group_.get(), FIONREAD, &queued) != 0) return fail(Error::posix(errno));
  // The kernel counts the fixed part of each record, not what follows it.
  auto left = static_cast<std::size_t>(queued) / sizeof(fanotify_event_metadata);
  const WatchedFolder watched = [this](std::string_view handle) { return numberOf(handle); };
  while (left > 0) {
    const ssize_t count = ::read(group_.get(), buffer_.get(), bufferSize);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0 && errno == EAGAIN) break;  // records were merged meanwhile
    if (count < 0) return fail(Error::posix(errno));
    drained.hasRecords = true;
    const std::span<const std::byte> bytes(buffer_.get(), static_cast<std::size_t>(count));
    const bool isSound = decodeFanotify(bytes, [&](const FanotifyRecord& record) {
      if (!addLooks(record, watched, looks)) drained.hasLost = true;
      if (left > 0) --left;
    });
    if (!isSound) drained.hasLost = true;
    if (!isSound) break;
  }
  return drained;
}

}  // namespace mirabel
