#include "host/bus/StagedImport.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "linux/operations/FileCopy.h"
#include "linux/operations/ItemNames.h"
#include "linux/operations/OperationProgress.h"
#include "mirabel/UniqueFd.h"

namespace mirabel::bus {
namespace {

namespace fs = std::filesystem;

constexpr mode_t permissions = 0777;

Result<void> requireReadableFile(int file, const struct stat& status) {
  if (S_ISDIR(status.st_mode)) return fail(Error::posix(EISDIR));
  if (!S_ISREG(status.st_mode)) return fail(Error::posix(ENOTSUP));
  const int flags = ::fcntl(file, F_GETFL);
  const bool isReadable = flags >= 0 && (flags & O_PATH) == 0 && (flags & O_ACCMODE) != O_WRONLY;
  if (!isReadable) return fail(Error::posix(EBADF, "the file is not open for reading"));
  return {};
}

// Read through a descriptor of its own the position is not the caller's. What may not be opened
// once more can be read all the same.
Result<void> copyContents(int from, int to, const FileCalls& calls) {
  const auto own = calls.reopen(from, O_RDONLY);
  OperationProgress unasked;
  FileCopy copy(calls, unasked, CopyKind::copy);
  const auto copied = own ? copy.copyWhole(own->get(), to, FileCopy::Position::own)
                          : copy.copyWhole(from, to, FileCopy::Position::shared);
  return copied ? Result<void>() : fail(copied.error());
}

// What can be read has to stay readable for whoever imports it. A file without a name, as programs
// make them in memory, has all permissions that there are.
Result<void> copyPermissions(const struct stat& from, int to) {
  if (from.st_nlink == 0) return {};
  if (::fchmod(to, (from.st_mode & permissions) | S_IRUSR) != 0) return fail(Error::posix(errno));
  return {};
}

}  // namespace

Result<StagedImport> StagedImport::of(int file, const std::string& name,
                                      const std::string& stagingFolder, const FileCalls& calls) {
  struct stat status {};
  if (::fstat(file, &status) != 0) return fail(Error::posix(errno));
  if (auto readable = requireReadableFile(file, status); !readable) return fail(readable.error());
  if (auto refusal = whyNoName(name)) return fail(*std::move(refusal));
  if (::mkdir(stagingFolder.c_str(), 0700) != 0 && errno != EEXIST)
    return fail(Error::posix(errno));
  std::string folder = stagingFolder + "/XXXXXX";
  if (::mkdtemp(folder.data()) == nullptr) return fail(Error::posix(errno));
  StagedImport staged;
  staged.folder_ = folder;
  staged.path_ = folder + "/" + name;
  const UniqueFd copy(
      ::open(staged.path_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC | O_NOFOLLOW, 0600));
  if (!copy) return fail(Error::posix(errno));
  if (auto copied = copyContents(file, copy.get(), calls); !copied) return fail(copied.error());
  if (auto set = copyPermissions(status, copy.get()); !set) return fail(set.error());
  return staged;
}

StagedImport::~StagedImport() {
  std::error_code ignored;
  if (!folder_.empty()) fs::remove_all(folder_, ignored);
}

void StagedImport::clear(const std::string& stagingFolder) {
  std::error_code ignored;
  fs::remove_all(stagingFolder, ignored);
}

}  // namespace mirabel::bus
