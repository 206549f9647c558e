#include "linux/operations/PendingWork.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "foundation/Log.h"
#include "linux/kernel/FileReplacement.h"
#include "linux/kernel/LongPath.h"
#include "platform/FileOperations.h"

namespace mirabel {
namespace {

constexpr const char* fileName = "pending";
constexpr const char* damagedFileName = "pending.damaged";
// More than that was not written by this program.
constexpr std::size_t largestFile = 16u << 20;

std::string keptPrefix() {
  return std::string(unfinishedNamePrefix) + "kept-";
}

std::string removedPrefix() {
  std::string id = UUID::random().description();
  std::erase(id, '-');
  return std::string(unfinishedNamePrefix) + id.substr(0, 16) + "-";
}

Result<Data> readFile(int folder) {
  UniqueFd file(::openat(folder, fileName, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  if (!file) return fail(Error::posix(errno));
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return fail(Error::posix(errno));
  if (!S_ISREG(status.st_mode) || static_cast<std::size_t>(status.st_size) > largestFile) {
    return fail(Error::posix(EINVAL));
  }
  Data bytes(static_cast<std::size_t>(status.st_size));
  errno = EIO;
  if (::pread(file.get(), bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
    return fail(Error::posix(errno));
  }
  return bytes;
}

template <class Record>
void append(std::vector<Record>& to, const std::vector<Record>& from) {
  to.insert(to.end(), from.begin(), from.end());
}

}  // namespace

PendingWork::PendingWork(VolumeIndex& index, const FileCalls& calls)
    : index_(index), calls_(calls), prefix_(removedPrefix()) {}

PendingRecords PendingWork::load() {
  const std::scoped_lock lock(mutex_);
  const int folder = index_.stateFolder().descriptor();
  const auto bytes = readFile(folder);
  if (!bytes && bytes.error().isPosix(ENOENT)) return {};
  if (!bytes) {
    unreadable_ = bytes.error();
    logError("can't read what operations left behind; " + bytes.error().description());
    return {};
  }
  auto records = PendingRecords::decode(*bytes);
  if (!records) {
    logError("what operations left behind is not known, the file is damaged");
    if (::renameat(folder, fileName, folder, damagedFileName) != 0)
      unreadable_ = Error::posix(errno);
    return {};
  }
  before_ = *std::move(records);
  return before_;
}

Result<void> PendingWork::settle(PendingRecords remaining) {
  const std::scoped_lock lock(mutex_);
  if (remaining == before_) return {};
  before_ = std::move(remaining);
  auto written = write();
  if (!written) {
    logError("can't note what operations left behind; " + written.error().description());
  }
  return written;
}

std::string PendingWork::nextName(std::string_view prefix) {
  return std::string(prefix) + std::to_string(++count_);
}

Result<std::string> PendingWork::temporaryName(const std::string& path) {
  auto folder = folderAt(path);
  if (!folder) return fail(folder.error());
  const std::scoped_lock lock(mutex_);
  const auto isNoted = [&](const PendingRemovals& each) { return each.folder == *folder; };
  if (std::ranges::none_of(records_.removals, isNoted)) {
    records_.removals.push_back({*std::move(folder), prefix_});
    if (auto written = write(); !written) {
      records_.removals.pop_back();
      return fail(written.error());
    }
  }
  return nextName(prefix_);
}

std::string PendingWork::hiddenName() {
  const std::scoped_lock lock(mutex_);
  return nextName(keptPrefix() + prefix_.substr(unfinishedNamePrefix.size()));
}

Result<PendingFolder> PendingWork::folderAt(const std::string& path) {
  if (auto checked = calls_.check("find folder"); !checked) return fail(checked.error());
  const auto status = statusOf(path);
  if (!status) return fail(status.error());
  const auto sighting = index_.learnPath(path, *status, false);
  if (!sighting) return fail(sighting.error());
  return PendingFolder{path, sighting->fileID};
}

Result<void> PendingWork::begin(const PendingMove& move) {
  const std::scoped_lock lock(mutex_);
  records_.moves.push_back(move);
  auto written = write();
  if (!written) records_.moves.pop_back();
  return written;
}

Result<void> PendingWork::end(const PendingMove& move) {
  const std::scoped_lock lock(mutex_);
  std::erase(records_.moves, move);
  auto written = write();
  if (!written) records_.moves.push_back(move);
  return written;
}

Result<void> PendingWork::begin(const PendingRename& rename) {
  const std::scoped_lock lock(mutex_);
  records_.renames.push_back(rename);
  auto written = write();
  if (!written) records_.renames.pop_back();
  return written;
}

void PendingWork::end(const PendingRename& rename) {
  const std::scoped_lock lock(mutex_);
  std::erase(records_.renames, rename);
  // Found once more by the next start, it is seen to be done.
  static_cast<void>(write());
}

void PendingWork::keepOnRecord(const std::string& path) {
  const std::scoped_lock lock(mutex_);
  kept_.push_back(path);
}

void PendingWork::close() {
  const std::scoped_lock lock(mutex_);
  // What a move has hidden is removed as one of these, by the start that finishes the move.
  const auto isMovedFrom = [&](const PendingFolder& folder) {
    return std::ranges::any_of(records_.moves, [&](const PendingMove& move) {
      return move.sourceFolder == folder || move.folder == folder;
    });
  };
  const auto isDone = [&](const PendingRemovals& each) {
    return std::ranges::find(kept_, each.folder.path) == kept_.end() && !isMovedFrom(each.folder);
  };
  if (std::erase_if(records_.removals, isDone) > 0) static_cast<void>(write());
}

Result<void> PendingWork::write() {
  if (unreadable_) return fail(*unreadable_);
  if (auto checked = calls_.check("note"); !checked) return checked;
  const int folder = index_.stateFolder().descriptor();
  PendingRecords all = before_;
  append(all.removals, records_.removals);
  append(all.moves, records_.moves);
  append(all.renames, records_.renames);
  if (all.isEmpty()) {
    if (::unlinkat(folder, fileName, 0) != 0 && errno != ENOENT) return fail(Error::posix(errno));
    return ::fsync(folder) == 0 ? Result<void>() : fail(Error::posix(errno));
  }
  auto bytes = all.encode();
  if (!bytes) return fail(bytes.error());
  return replaceFile(folder, fileName, *bytes);
}

}  // namespace mirabel
