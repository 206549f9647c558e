#include "linux/icons/BoundedFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

Result<void> checkFile(const struct stat& status, std::size_t limit) {
  if (!S_ISREG(status.st_mode)) return fail(Error::posix(EINVAL, "it is no regular file"));
  if (static_cast<std::uint64_t>(status.st_size) > limit) return fail(Error::posix(EFBIG));
  return {};
}

Result<Data> readAll(int descriptor, std::size_t limit) {
  constexpr std::size_t step = 64u << 10;
  Data bytes;
  for (;;) {
    const std::size_t filled = bytes.size();
    bytes.resize(filled + step);
    const ssize_t count = ::read(descriptor, bytes.data() + filled, step);
    if (count < 0 && errno != EINTR) return fail(Error::posix(errno));
    bytes.resize(filled + (count > 0 ? static_cast<std::size_t>(count) : 0));
    if (count == 0) return bytes;
    // It may have grown since it was looked at.
    if (bytes.size() > limit) return fail(Error::posix(EFBIG));
  }
}

}  // namespace

std::string joinedPath(std::initializer_list<std::string_view> parts) {
  std::string path;
  for (const std::string_view part : parts) {
    if (!path.empty()) path += '/';
    path += part;
  }
  return path;
}

bool isRegularFile(const std::string& path) {
  struct stat status {};
  return ::stat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

Result<Data> readBoundedFile(const std::string& path, std::size_t limit) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return fail(Error::posix(errno));
  if (auto checked = checkFile(status, limit); !checked) return fail(checked.error());
  const UniqueFd file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file) return fail(Error::posix(errno));
  // Something else may have been put there meanwhile.
  if (::fstat(file.get(), &status) != 0) return fail(Error::posix(errno));
  if (auto checked = checkFile(status, limit); !checked) return fail(checked.error());
  return readAll(file.get(), limit);
}

}  // namespace mirabel
