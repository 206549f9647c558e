#include "linux/operations/PendingWork.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <iterator>
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
// Whoever works in the same few folders again and again has them noted once. Each is written anew
// with every other.
constexpr std::size_t mostUnused = 32;

std::string keptPrefix() {
  return std::string(unfinishedNamePrefix) + "kept-";
}

std::string removedPrefix() {
  std::string id = UUID::random().description();
  std::erase(id, '-');
  return std::string(unfinishedNamePrefix) + id.substr(0, 16) + "-";
}

/// Nothing of what can't be a record.
Result<Data> readFile(int folder) {
  UniqueFd file(::openat(folder, fileName, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  if (!file) return fail(Error::posix(errno));
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) return fail(Error::posix(errno));
  if (!S_ISREG(status.st_mode) || static_cast<std::size_t>(status.st_size) > largestFile)
    return Data();
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
  const auto refuse = [this](std::int64_t code) {
    unreadable_ = Error::posix(static_cast<int>(code),
                               "what operations left behind can't be read from \"" +
                                   index_.stateFolder().path() + "/" + fileName + "\"");
  };
  if (!bytes) {
    refuse(bytes.error().code);
    logError("can't read what operations left behind; " + bytes.error().description());
    return {};
  }
  auto records = PendingRecords::decode(*bytes);
  if (!records) {
    logError("what operations left behind is not known, the file is damaged");
    if (::renameat(folder, fileName, folder, damagedFileName) != 0) refuse(errno);
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

std::vector<PendingWork::Removals>::iterator PendingWork::removalsIn(const PendingFolder& folder) {
  return std::ranges::find(removals_, folder, &Removals::folder);
}

Result<TemporaryName> PendingWork::temporaryName(const std::string& path) {
  auto folder = folderAt(path);
  if (!folder) return fail(folder.error());
  const std::scoped_lock lock(mutex_);
  auto removals = removalsIn(*folder);
  if (removals == removals_.end()) {
    forgetUnused(mostUnused);
    removals_.push_back({*folder});
    if (auto written = write(); !written) {
      removals_.pop_back();
      return fail(written.error());
    }
    removals = std::prev(removals_.end());
  }
  ++removals->names;
  return TemporaryName{nextName(prefix_), *std::move(folder)};
}

void PendingWork::isGone(const TemporaryName& temporary) {
  const std::scoped_lock lock(mutex_);
  --removalsIn(temporary.folder)->names;
}

void PendingWork::forgetUnused(std::size_t most) {
  const auto isUnused = [](const Removals& removals) { return removals.names == 0; };
  auto unused = static_cast<std::size_t>(std::ranges::count_if(removals_, isUnused));
  std::erase_if(removals_,
                [&](const Removals& removals) { return isUnused(removals) && unused-- > most; });
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
  moves_.push_back(move);
  auto written = write();
  if (!written) moves_.pop_back();
  return written;
}

Result<void> PendingWork::end(const PendingMove& move) {
  const std::scoped_lock lock(mutex_);
  std::erase(moves_, move);
  auto written = write();
  if (!written) moves_.push_back(move);
  return written;
}

Result<void> PendingWork::begin(const PendingRename& rename) {
  const std::scoped_lock lock(mutex_);
  renames_.push_back(rename);
  auto written = write();
  if (!written) renames_.pop_back();
  return written;
}

void PendingWork::end(const PendingRename& rename) {
  const std::scoped_lock lock(mutex_);
  std::erase(renames_, rename);
  // Found once more by the next start, it is seen to be done.
  static_cast<void>(write());
}

void PendingWork::close() {
  const std::scoped_lock lock(mutex_);
  const std::size_t noted = removals_.size();
  forgetUnused(0);
  if (removals_.size() < noted) static_cast<void>(write());
}

Result<void> PendingWork::write() {
  if (unreadable_) return fail(*unreadable_);
  if (auto checked = calls_.check("note"); !checked) return checked;
  const int folder = index_.stateFolder().descriptor();
  PendingRecords all = before_;
  for (const Removals& removals : removals_)
    all.removals.push_back({removals.folder, prefix_});
  append(all.moves, moves_);
  append(all.renames, renames_);
  if (all.isEmpty()) {
    if (::unlinkat(folder, fileName, 0) != 0 && errno != ENOENT) return fail(Error::posix(errno));
    return ::fsync(folder) == 0 ? Result<void>() : fail(Error::posix(errno));
  }
  auto bytes = all.encode();
  if (!bytes) return fail(bytes.error());
  return replaceFile(folder, fileName, *bytes);
}

}  // namespace mirabel
