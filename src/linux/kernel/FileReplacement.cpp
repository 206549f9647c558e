#include "linux/kernel/FileReplacement.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "mirabel/UniqueFd.h"

namespace mirabel {
namespace {

/// `write` takes what is left of the bytes, and answers like the system call.
Result<void> writeRest(std::string_view bytes, const auto& write) {
  while (!bytes.empty()) {
    const ssize_t count = write(bytes);
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return fail(Error::posix(count < 0 ? errno : EIO));
    bytes.remove_prefix(static_cast<std::size_t>(count));
  }
  return {};
}

}  // namespace

Result<void> writeAll(int file, std::string_view bytes) {
  return writeRest(
      bytes, [file](std::string_view rest) { return ::write(file, rest.data(), rest.size()); });
}

Result<void> writeAllAt(int file, std::string_view bytes, std::int64_t offset) {
  const std::int64_t end = offset + static_cast<std::int64_t>(bytes.size());
  return writeRest(bytes, [file, end](std::string_view rest) {
    return ::pwrite(file, rest.data(), rest.size(), end - static_cast<std::int64_t>(rest.size()));
  });
}

Result<void> replaceFile(int folder, const std::string& name, const Data& bytes) {
  const std::string temporary = name + ".new";
  // What is there is left from a crash, or was put there by somebody.
  ::unlinkat(folder, temporary.c_str(), 0);
  const UniqueFd file(
      ::openat(folder, temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (!file) return fail(Error::posix(errno));
  auto written = writeAll(file.get(), stringView(bytes));
  if (written && ::fsync(file.get()) != 0) written = fail(Error::posix(errno));
  if (written && ::renameat(folder, temporary.c_str(), folder, name.c_str()) != 0) {
    written = fail(Error::posix(errno));
  }
  if (!written) {
    ::unlinkat(folder, temporary.c_str(), 0);
    return written;
  }
  if (::fsync(folder) != 0) return fail(Error::posix(errno));
  return {};
}

}  // namespace mirabel
