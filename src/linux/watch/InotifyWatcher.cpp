#include "linux/watch/InotifyWatcher.h"

#include <cerrno>
#include <span>
#include <string>
#include <sys/inotify.h>
#include <sys/ioctl.h>
#include <utility>

#include "linux/watch/InotifyRecords.h"

namespace mirabel {
namespace {

constexpr std::size_t readSize = 1u << 18;
constexpr std::uint32_t anyChange = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO |
                                    IN_MODIFY | IN_ATTRIB | IN_CLOSE_WRITE | IN_DELETE_SELF |
                                    IN_ONLYDIR;

}  // namespace

Result<std::unique_ptr<FolderWatcher>> InotifyWatcher::create() {
  UniqueFd instance(::inotify_init1(IN_NONBLOCK | IN_CLOEXEC));
  if (!instance) return fail(Error::posix(errno));
  return std::unique_ptr<FolderWatcher>(new InotifyWatcher(std::move(instance)));
}

InotifyWatcher::InotifyWatcher(UniqueFd instance)
    : instance_(std::move(instance)),
      buffer_(std::make_unique_for_overwrite<std::byte[]>(readSize)) {}

Result<void> InotifyWatcher::watch(int folder, std::uint64_t id) {
  // The only way to name an open folder to this interface.
  const std::string path = "/proc/self/fd/" + std::to_string(folder);
  const int watch = ::inotify_add_watch(instance_.get(), path.c_str(), anyChange);
  if (watch < 0) return fail(Error::posix(errno));
  if (const auto known = watches_.find(id); known != watches_.end() && known->second != watch) {
    end(id);
  }
  // A folder that had another number is not to be ended under that.
  const auto [entry, isNew] = folders_.try_emplace(watch, id);
  if (!isNew && entry->second != id) watches_.erase(std::exchange(entry->second, id));
  watches_[id] = watch;
  return {};
}

bool InotifyWatcher::isWatched(std::uint64_t id) const {
  return watches_.contains(id);
}

std::size_t InotifyWatcher::watchedFolders() const {
  return watches_.size();
}

void InotifyWatcher::forget(std::uint64_t id) {
  end(id);
}

void InotifyWatcher::end(std::uint64_t id) {
  const auto known = watches_.find(id);
  if (known == watches_.end()) return;
  ::inotify_rm_watch(instance_.get(), known->second);
  folders_.erase(known->second);
  watches_.erase(known);
}

void InotifyWatcher::drop(int watch) {
  const auto folder = folders_.find(watch);
  if (folder == folders_.end()) return;
  watches_.erase(folder->second);
  folders_.erase(folder);
}

Result<FolderWatcher::Drained> InotifyWatcher::drain(LookList& looks) {
  Drained drained;
  int queued = 0;
  if (::ioctl(instance_.get(), FIONREAD, &queued) != 0) return fail(Error::posix(errno));
  while (queued > 0) {
    const ssize_t count = ::read(instance_.get(), buffer_.get(), readSize);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0 && errno == EAGAIN) break;
    if (count < 0) return fail(Error::posix(errno));
    drained.hasRecords = true;
    queued -= static_cast<int>(count);
    const std::span<const std::byte> bytes(buffer_.get(), static_cast<std::size_t>(count));
    const bool isSound = decodeInotify(bytes, [&](const InotifyRecord& record) {
      const auto folder = folders_.find(record.watch);
      const auto id = folder == folders_.end() ? std::nullopt : std::optional(folder->second);
      if (!addLook(record, id, looks)) drained.hasLost = true;
      // The kernel has ended the watch: the folder is gone.
      if ((record.mask & IN_IGNORED) != 0) drop(record.watch);
    });
    if (!isSound) drained.hasLost = true;
    if (!isSound) break;
  }
  return drained;
}

}  // namespace mirabel
