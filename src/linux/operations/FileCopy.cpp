#include "linux/operations/FileCopy.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "linux/kernel/AttributeCalls.h"
#include "linux/kernel/FileReplacement.h"

namespace mirabel {
namespace {

// Descriptors that are open for it: a few such operations run at once.
constexpr std::size_t mostUnsynced = 128;
constexpr std::size_t mostUnsyncedPairs = 32;
constexpr std::size_t bufferSize = 64u << 10;
// Between two of these it is seen whether to go on.
constexpr std::int64_t kernelPieceSize = 16 << 20;
constexpr int mostAttempts = 3;

bool isUnchanged(const ObjectStatus& before, const ObjectStatus& after) {
  return before.size == after.size && before.modificationTime == after.modificationTime &&
         before.changeTime == after.changeTime;
}

// What file systems and kernels say when they can't copy by themselves, between these two files.
bool cannot(int failure) {
  constexpr int codes[] = {EXDEV, EINVAL, ENOSYS, EOPNOTSUPP, ENOTTY, EPERM, ETXTBSY, EBADF};
  return std::ranges::find(codes, failure) != std::end(codes);
}

/// The next run of data at or after `from`; an empty one at `end` where there is none.
std::pair<std::int64_t, std::int64_t> dataAfter(int file, std::int64_t from, std::int64_t end) {
  const auto start = ::lseek(file, from, SEEK_DATA);
  if (start < 0) return errno == ENXIO ? std::pair(end, end) : std::pair(from, end);
  const auto stop = ::lseek(file, start, SEEK_HOLE);
  return {start, stop < 0 ? end : std::min<std::int64_t>(stop, end)};
}

}  // namespace

Result<void> FileCopy::copy(UniqueFd source, int folder, const std::string& name) {
  auto made = calls_.open(folder, name, O_RDWR | O_CREAT | O_EXCL, 0600);
  if (!made) return fail(made.error());
  const auto status = copyWhole(source.get(), made->get(), Position::own);
  if (!status) return fail(status.error());
  if (auto done = copyProperties(source.get(), *status, made->get()); !done) return done;
  calls_.beginWriting(made->get());
  progress_.entriesCopied.fetch_add(1, std::memory_order_relaxed);
  unsynced_.push_back({kind_ == CopyKind::move ? std::move(source) : UniqueFd(), std::move(*made)});
  const std::size_t most = kind_ == CopyKind::move ? mostUnsyncedPairs : mostUnsynced;
  return unsynced_.size() < most ? Result<void>() : flush();
}

Result<ObjectStatus> FileCopy::copyWhole(int source, int copy, Position position) {
  for (int attempt = 1;; ++attempt) {
    auto before = calls_.status(source);
    if (!before) return fail(before.error());
    if (before->kind != FileKind::regular) return fail(Error::posix(EAGAIN));
    // Of an attempt before this one.
    if (attempt > 1 && ::ftruncate(copy, 0) != 0) return fail(Error::posix(errno));
    if (auto copied = copyContents(source, *before, copy, position); !copied)
      return fail(copied.error());
    const auto after = calls_.status(source);
    if (!after) return fail(after.error());
    if (isUnchanged(*before, *after)) return before;
    if (attempt == mostAttempts)
      return fail(Error::posix(EAGAIN, "it was written to while it was copied"));
  }
}

Result<void> FileCopy::flush() {
  for (const Pair& pair : unsynced_) {
    if (auto synced = calls_.sync(pair.copy.get()); !synced) return synced;
    if (kind_ != CopyKind::move) continue;
    if (auto same = compareContents(pair.source.get(), pair.copy.get()); !same) return same;
  }
  unsynced_.clear();
  return {};
}

Result<void> FileCopy::copyContents(int source, const ObjectStatus& status, int copy,
                                    Position position) {
  if (auto checked = calls_.check("copy contents"); !checked) return checked;
  const auto size = static_cast<std::int64_t>(status.size);
  if (size > 0) {
    auto cloned = clone(source, copy);
    if (!cloned) return fail(cloned.error());
    if (*cloned) return {};
  }
  // Some files tell no size and have contents all the same.
  if (size == 0) {
    if (auto copied = copyByHand(source, copy, 0, INT64_MAX); !copied) return copied;
  }
  for (std::int64_t from = 0; from < size;) {
    const auto [start, stop] =
        position == Position::own ? dataAfter(source, from, size) : std::pair(from, size);
    if (start < stop) {
      if (auto copied = copyRange(source, copy, start, stop); !copied) return copied;
    }
    from = std::max(stop, from + 1);
  }
  if (size > 0 && ::ftruncate(copy, size) != 0) return fail(Error::posix(errno));
  return {};
}

Result<bool> FileCopy::clone(int source, int copy) {
  if (!mayClone_) return false;
  if (::ioctl(copy, FICLONE, source) == 0) return true;
  if (!cannot(errno)) return fail(Error::posix(errno));
  mayClone_ = false;
  return false;
}

Result<void> FileCopy::copyRange(int source, int copy, std::int64_t from, std::int64_t to) {
  while (from < to && mayCopyInKernel_) {
    if (auto checked = calls_.check("go on copying"); !checked) return checked;
    off64_t in = from;
    off64_t out = from;
    const auto wanted = static_cast<std::size_t>(std::min(to - from, kernelPieceSize));
    const ssize_t copied = ::copy_file_range(source, &in, copy, &out, wanted, 0);
    if (copied < 0 && errno == EINTR) continue;
    if (copied < 0 && !cannot(errno)) return fail(Error::posix(errno));
    if (copied < 0) mayCopyInKernel_ = false;
    if (copied <= 0) break;
    from += copied;
    progress_.bytesCopied.fetch_add(static_cast<std::uint64_t>(copied), std::memory_order_relaxed);
  }
  return from < to ? copyByHand(source, copy, from, to) : Result<void>();
}

Result<void> FileCopy::copyByHand(int source, int copy, std::int64_t from, std::int64_t to) {
  std::vector<char> buffer(bufferSize);
  while (from < to) {
    if (auto checked = calls_.check("go on copying"); !checked) return checked;
    const auto wanted = std::min<std::int64_t>(to - from, bufferSize);
    const ssize_t count = ::pread(source, buffer.data(), static_cast<std::size_t>(wanted), from);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return fail(Error::posix(errno));
    if (count == 0) return {};
    auto written = writeAllAt(copy, {buffer.data(), static_cast<std::size_t>(count)}, from);
    if (!written) return written;
    from += count;
    progress_.bytesCopied.fetch_add(static_cast<std::uint64_t>(count), std::memory_order_relaxed);
  }
  return {};
}

Result<void> FileCopy::copyProperties(int source, const ObjectStatus& status, int copy) const {
  // First what a file without permission to write would refuse.
  if (auto copied = copyAttributes(source, copy); !copied) return copied;
  if (kind_ == CopyKind::move && status.owner != ::geteuid()) {
    // Only root may; what others move becomes theirs.
    constexpr auto sameGroup = static_cast<gid_t>(-1);
    if (::fchown(copy, status.owner, sameGroup) != 0 && errno != EPERM) {
      return fail(Error::posix(errno));
    }
  }
  if (auto set = calls_.setMode(copy, status.mode & copiedPermissions); !set) return set;
  return calls_.setTime(copy, {}, status.modificationTime);
}

Result<void> FileCopy::copyAttributes(int source, int copy) const {
  auto attributes = calls_.attributes(source);
  if (!attributes) return fail(attributes.error());
  for (const auto& [name, value] : *attributes) {
    auto set = calls_.setAttribute(copy, name, value);
    // Access control lists are the file system's own affair, the user's attributes are not.
    const bool isUsers = name.starts_with(userAttributePrefix);
    if (!set && (isUsers || !set.error().isPosix(ENOTSUP))) return set;
  }
  return {};
}

Result<void> FileCopy::compareContents(int source, int copy) const {
  if (auto checked = calls_.check("compare"); !checked) return checked;
  // From the disk, as far as the kernel can be had to read it anew.
  ::posix_fadvise(copy, 0, 0, POSIX_FADV_DONTNEED);
  std::vector<char> ours(bufferSize);
  std::vector<char> theirs(bufferSize);
  for (std::int64_t offset = 0;;) {
    const ssize_t read = ::pread(source, theirs.data(), bufferSize, offset);
    const ssize_t made = ::pread(copy, ours.data(), bufferSize, offset);
    if (read < 0 || made < 0) return fail(Error::posix(errno));
    if (read != made ||
        std::memcmp(ours.data(), theirs.data(), static_cast<std::size_t>(read)) != 0)
      return fail(Error::posix(EIO, "the copy is not like its source"));
    if (read == 0) return {};
    offset += read;
  }
}

}  // namespace mirabel
