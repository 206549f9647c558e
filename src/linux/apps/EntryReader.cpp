#include "linux/apps/EntryReader.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <utility>

#include "foundation/LookFailure.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

constexpr std::string_view notRegular = "its entry is no regular file";
constexpr std::string_view tooLarge = "its entry is too large";
constexpr std::string_view unreadable = "its entry can't be read";
constexpr std::string_view noEntry = "its entry is no desktop entry";

// The entries of both types are looked at in turn, and by more than one thread.
constexpr std::uint64_t passesKept = 4;

bool isSame(const ObjectStatus& a, const ObjectStatus& b) {
  return a.inode == b.inode && a.device == b.device && a.size == b.size &&
         a.modificationTime == b.modificationTime && a.changeTime == b.changeTime;
}

Result<EntryReading> failedReading(const Error& error) {
  if (!saysOutOfReach(error)) return fail(error);
  const bool isGone = error.isPosix(ENOENT) || error.isPosix(ENOTDIR);
  return EntryReading{nullptr, isGone ? std::string_view() : unreadable};
}

// One byte more than allowed at the most, by which a file that is too large is known.
Result<std::string> bytesOf(int file, std::size_t expected, std::size_t limit) {
  std::string bytes(std::min(expected, limit) + 1, '\0');
  std::size_t filled = 0;
  while (true) {
    const ssize_t count = ::read(file, bytes.data() + filled, bytes.size() - filled);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return fail(Error::posix(errno));
    filled += static_cast<std::size_t>(count);
    if (count == 0 || filled > limit) break;
    // It grows while it is read.
    if (filled == bytes.size()) bytes.resize(std::min(2 * bytes.size(), limit + 1));
  }
  bytes.resize(filled);
  return bytes;
}

}  // namespace

EntryReader::EntryReader(std::vector<std::string> languages, std::size_t mostBytes)
    : languages_(std::move(languages)), mostBytes_(mostBytes) {}

Result<EntryReading> EntryReader::read(const std::string& path) {
  const auto now = statusOfTarget(path);
  if (!now) return failedReading(now.error());
  // A device must not even be opened.
  if (now->kind != FileKind::regular) return EntryReading{nullptr, notRegular};
  EntryReading reading;
  if (findKept(path, *now, reading)) return reading;
  ObjectStatus status;
  auto anew = readAnew(path, status);
  if (!anew) return failedReading(anew.error());
  keep(path, status, *anew);
  return anew;
}

Result<EntryReading> EntryReader::readAnew(const std::string& path, ObjectStatus& status) const {
  const UniqueFd file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file) return fail(Error::posix(errno));
  const auto seen = statusAt(file.get(), "");
  if (!seen) return fail(seen.error());
  status = *seen;
  if (status.kind != FileKind::regular) return EntryReading{nullptr, notRegular};
  if (status.size > mostBytes_) return EntryReading{nullptr, tooLarge};
  const auto bytes = bytesOf(file.get(), status.size, mostBytes_);
  if (!bytes) return fail(bytes.error());
  if (bytes->size() > mostBytes_) return EntryReading{nullptr, tooLarge};
  auto entry = DesktopEntry::parse(*bytes, languages_);
  if (!entry) return EntryReading{nullptr, noEntry};
  return EntryReading{std::make_shared<const DesktopEntry>(std::move(*entry)), {}};
}

bool EntryReader::findKept(const std::string& path, const ObjectStatus& now,
                           EntryReading& reading) {
  const std::lock_guard lock(mutex_);
  const auto found = kept_.find(path);
  if (found == kept_.end() || !isSame(found->second.status, now)) return false;
  found->second.pass = pass_;
  reading = found->second.reading;
  return true;
}

void EntryReader::keep(const std::string& path, const ObjectStatus& status,
                       const EntryReading& reading) {
  const std::lock_guard lock(mutex_);
  if (isSettled(status.changeTime, status.seenAt)) {
    kept_.insert_or_assign(path, Kept{status, reading, pass_});
  } else {
    kept_.erase(path);
  }
}

void EntryReader::endPass() {
  const std::lock_guard lock(mutex_);
  ++pass_;
  std::erase_if(kept_, [this](const auto& item) { return item.second.pass + passesKept < pass_; });
}

}  // namespace mirabel
