#include "support/FakeCacheFiles.h"

#include <algorithm>
#include <cerrno>
#include <limits>
#include <utility>

namespace mirabel::testing {

Result<std::optional<Data>> FakeCacheFiles::read(const URL& file, std::size_t limit) {
  const std::lock_guard lock(mutex_);
  if (auto error = faults_.hit(Op::cacheRead)) return fail(*std::move(error));
  const auto found = files.find(file.path());
  if (found == files.end()) return std::nullopt;
  if (found->second.size() > limit) return fail(Error::posix(EFBIG));
  return found->second;
}

Result<void> FakeCacheFiles::createDirectory(const URL& folder) {
  const std::lock_guard lock(mutex_);
  if (auto error = faults_.hit(Op::cacheFolder)) return fail(*std::move(error));
  folders.insert(folder.path());
  return {};
}

Result<void> FakeCacheFiles::replace(const URL& file, const Data& bytes) {
  const std::lock_guard lock(mutex_);
  if (auto error = faults_.hit(Op::cacheReplace)) return fail(*std::move(error));
  if (!folders.contains(file.deletingLastPathComponent().path())) return fail(Error::posix(ENOENT));
  files.insert_or_assign(file.path(), bytes);
  return {};
}

Result<std::uint64_t> FakeCacheFiles::claimVersion(std::string_view name, std::uint64_t after) {
  std::uint64_t claimed = 0;
  {
    const std::lock_guard lock(mutex_);
    if (auto error = faults_.hit(Op::claimVersion)) return fail(*std::move(error));
    std::uint64_t& version = versions[std::string(name)];
    const std::uint64_t greatest = std::max(version, after);
    if (greatest == std::numeric_limits<std::uint64_t>::max()) return fail(Error::posix(EOVERFLOW));
    claimed = version = greatest + 1;
  }
  if (const auto meanwhile = std::exchange(afterClaim, nullptr)) meanwhile();
  return claimed;
}

}  // namespace mirabel::testing
