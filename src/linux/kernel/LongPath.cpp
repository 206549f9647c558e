#include "linux/kernel/LongPath.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <string_view>
#include <sys/syscall.h>

namespace mirabel {
namespace {

Result<UniqueFd> openStep(int directory, const char* path, int flags, unsigned long long resolve) {
  open_how how{};
  how.flags = static_cast<unsigned long long>(flags) | O_NOFOLLOW | O_CLOEXEC;
  how.resolve = resolve;
  // EAGAIN: a rename elsewhere made the kernel unsure whether the walk stayed beneath.
  for (int attempt = 0;; ++attempt) {
    const long fd = ::syscall(SYS_openat2, directory, path, &how, sizeof(how));
    if (fd >= 0) return UniqueFd(static_cast<int>(fd));
    if ((errno == EAGAIN && attempt < 64) || errno == EINTR) continue;
    return fail(kernelError(errno));
  }
}

}  // namespace

Error kernelError(int errnoValue) {
  return Error::posix(errnoValue == ESTALE ? EREMOTEIO : errnoValue);
}

SplitPath splitPath(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return {"", path};
  if (slash == 0) return {"/", path.substr(1)};
  return {path.substr(0, slash), path.substr(slash + 1)};
}

std::string withoutDots(const std::string& path) {
  if (path.find("/.") == std::string::npos) return path;
  std::string result;
  for (std::size_t start = 1; start <= path.size();) {
    const std::size_t end = std::min(path.find('/', start), path.size());
    const std::string_view component = std::string_view(path).substr(start, end - start);
    if (component == "..") {
      result.resize(result.empty() ? 0 : result.rfind('/'));
    } else if (!component.empty() && component != ".") {
      result.append(1, '/').append(component);
    }
    start = end + 1;
  }
  return result.empty() ? "/" : result;
}

Result<UniqueFd> openLongPath(int directory, const std::string& path, int flags,
                              unsigned long long resolve) {
  if (path.empty()) return openStep(directory, ".", flags, resolve);
  UniqueFd reached;
  std::size_t start = 0;
  while (path.size() - start >= longPathThreshold) {
    // The longest run of whole components that fits.
    const std::size_t slash = path.rfind('/', start + longPathThreshold - 1);
    if (slash == std::string::npos || slash <= start) return fail(Error::posix(ENAMETOOLONG));
    auto step = openStep(reached ? reached.get() : directory,
                         path.substr(start, slash - start).c_str(), O_PATH | O_DIRECTORY, resolve);
    if (!step) return fail(step.error());
    reached = std::move(*step);
    start = slash + 1;
  }
  return openStep(reached ? reached.get() : directory, path.c_str() + start, flags, resolve);
}

}  // namespace mirabel
