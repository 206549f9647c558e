#include "linux/files/LinuxResourceValues.h"

#include <cerrno>

#include "linux/files/Prefetch.h"

namespace mirabel {

Result<ResourceValues> LinuxResourceValues::readValues(const URL& url) {
  auto values = lookAtObject(context_, url);
  if (values) return values;
  const Error& error = values.error();
  if (error.isPosix(ENOENT) || error.isPosix(ENOTDIR)) {
    return fail(Error::file(FileErrorCode::noSuchFile));
  }
  return values;
}

Result<void> LinuxResourceValues::prefetch(std::span<const URL> urls) {
  return prefetchAll(context_, urls);
}

}  // namespace mirabel
