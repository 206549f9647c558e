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
  if (auto marked = mark(folder); !marked) return marked;
  if (const auto known = handles_.find(id); known != handles_.end()) {
    if (*known->second == *handle) return {};
    folders_.erase(folders_.find(*known->second));
  }
  const auto [entry, isNew] = folders_.try_emplace(std::move(*handle), id);
  if (!isNew) handles_.erase(std::exchange(entry->second, id));
  handles_[id] = &entry->first;
  return {};
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
  return handles_.contains(id);
}

std::size_t FanotifyWatcher::watchedFolders() const {
  return handles_.size();
}

void FanotifyWatcher::forget(std::uint64_t id) {
  const auto known = handles_.find(id);
  if (known == handles_.end()) return;
  folders_.erase(folders_.find(*known->second));
  handles_.erase(known);
}

Result<FolderWatcher::Drained> FanotifyWatcher::drain(LookList& looks) {
  Drained drained;
  int queued = 0;
  if (::ioctl(group_.get(), FIONREAD, &queued) != 0) return fail(Error::posix(errno));
  // The kernel counts the fixed part of each record, not what follows it.
  auto left = static_cast<std::size_t>(queued) / sizeof(fanotify_event_metadata);
  const WatchedFolder watched = [&](std::string_view handle) -> std::optional<std::uint64_t> {
    const auto folder = folders_.find(handle);
    if (folder == folders_.end()) return std::nullopt;
    return folder->second;
  };
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
