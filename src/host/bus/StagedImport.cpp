#include "host/bus/StagedImport.h"

#include <array>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <string_view>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "linux/kernel/FileReplacement.h"
#include "linux/operations/ItemNames.h"
#include "mirabel/UniqueFd.h"

namespace mirabel::bus {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t pieceSize = 1 << 20;
// Between two of these it is seen whether to go on.
constexpr std::size_t kernelPieceSize = 1 << 24;
constexpr mode_t permissions = 0777;

Result<void> requireReadableFile(int file, const struct stat& status) {
  if (S_ISDIR(status.st_mode)) return fail(Error::posix(EISDIR));
  if (!S_ISREG(status.st_mode)) return fail(Error::posix(ENOTSUP));
  const int flags = ::fcntl(file, F_GETFL);
  const bool isReadable = flags >= 0 && (flags & O_PATH) == 0 && (flags & O_ACCMODE) != O_WRONLY;
  if (!isReadable) return fail(Error::posix(EBADF, "the file is not open for reading"));
  return {};
}

// The kernel copies by itself where both files are on one volume, and shares blocks where it can.
Result<void> copyAll(int from, int to, const std::stop_token& stopping) {
  off_t position = 0;
  while (!stopping.stop_requested()) {
    const ssize_t count = ::copy_file_range(from, &position, to, nullptr, kernelPieceSize, 0);
    if (count == 0) break;
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) break;
  }
  // It also says nothing of files that the kernel makes up as they are read.
  std::string piece(pieceSize, '\0');
  while (true) {
    if (stopping.stop_requested()) return fail(Error::posix(ECANCELED));
    const ssize_t count = ::pread(from, piece.data(), piece.size(), position);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return fail(Error::posix(errno));
    if (count == 0) return {};
    const std::string_view bytes(piece.data(), static_cast<std::size_t>(count));
    if (auto written = writeAll(to, bytes); !written) return written;
    position += count;
  }
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
                                      const std::string& stagingFolder,
                                      const std::stop_token& stopping) {
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
  if (auto copied = copyAll(file, copy.get(), stopping); !copied) return fail(copied.error());
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
