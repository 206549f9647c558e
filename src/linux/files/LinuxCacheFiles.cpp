#include "linux/files/LinuxCacheFiles.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <fcntl.h>
#include <filesystem>
#include <limits>
#include <sys/file.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

#include "linux/kernel/FileReplacement.h"
#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

constexpr std::uint64_t largestVersion = std::numeric_limits<std::uint64_t>::max();
// A number of 20 digits and a newline.
constexpr std::size_t largestVersionFile = 21;

Result<std::optional<Data>> readAt(int folder, const std::string& name, std::size_t limit) {
  // Without O_NONBLOCK a FIFO under that name would keep us waiting.
  const UniqueFd file(
      ::openat(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  if (!file && errno == ENOENT) return std::nullopt;
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0) return fail(Error::posix(errno));
  if (!S_ISREG(status.st_mode)) return fail(Error::posix(EINVAL));
  Data bytes;
  Data piece(64u << 10);
  while (true) {
    const ssize_t count = ::read(file.get(), piece.data(), piece.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return fail(Error::posix(errno));
    if (count == 0) return bytes;
    bytes.insert(bytes.end(), piece.begin(), piece.begin() + count);
    if (bytes.size() > limit) return fail(Error::posix(EFBIG));
  }
}

/// Locked until it is closed. Processes hold it for no longer than one file is written.
Result<UniqueFd> lockedFolder(const std::string& path) {
  UniqueFd folder(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!folder) return fail(Error::posix(errno, path));
  while (::flock(folder.get(), LOCK_EX) != 0)
    if (errno != EINTR) return fail(Error::posix(errno));
  return folder;
}

/// Nothing for bytes that are no such number.
std::optional<std::uint64_t> versionFrom(const Data& bytes) {
  const std::string_view text = stringView(bytes);
  std::uint64_t version = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), version);
  const bool isWhole = error == std::errc() && end + 1 == text.data() + text.size() && *end == '\n';
  return isWhole ? std::optional(version) : std::nullopt;
}

std::uint64_t versionFromTime() {
  return static_cast<std::uint64_t>(std::max<std::int64_t>(Date::now().seconds, 0)) << 20;
}

}  // namespace

Result<std::optional<Data>> LinuxCacheFiles::read(const URL& file, std::size_t limit) {
  if (file.path().empty()) return fail(Error::posix(EINVAL));
  return readAt(AT_FDCWD, file.path(), limit);
}

Result<void> LinuxCacheFiles::createDirectory(const URL& folder) {
  std::error_code error;
  std::filesystem::create_directories(folder.path(), error);
  if (error) return fail(Error::posix(error.value(), folder.path()));
  return {};
}

Result<void> LinuxCacheFiles::replace(const URL& file, const Data& bytes) {
  const auto folder = lockedFolder(file.deletingLastPathComponent().path());
  if (!folder) return fail(folder.error());
  auto replaced = replaceFile(folder->get(), std::string(file.lastPathComponent()), bytes);
  if (!replaced) replaced.error().userInfo.try_emplace(std::string(errorkey::detail), file.path());
  return replaced;
}

Result<std::uint64_t> LinuxCacheFiles::claimVersion(std::string_view name, std::uint64_t after) {
  const std::string fileName = "version-" + std::string(name);
  const auto folder = lockedFolder(stateFolder_);
  if (!folder) return fail(folder.error());
  const auto stored = readAt(folder->get(), fileName, largestVersionFile);
  // A file that is too long is as damaged as one without a number.
  if (!stored && !stored.error().isPosix(EFBIG)) return fail(stored.error());
  std::uint64_t greatest = after;
  if (!stored || *stored) {
    const auto version = stored ? versionFrom(**stored) : std::nullopt;
    greatest = std::max(greatest, version ? *version : versionFromTime());
  }
  if (greatest == largestVersion) return fail(Error::posix(EOVERFLOW));
  const std::string text = std::to_string(greatest + 1) + "\n";
  if (auto written = replaceFile(folder->get(), fileName, dataFromString(text)); !written) {
    return fail(written.error());
  }
  return greatest + 1;
}

}  // namespace mirabel
