#include "linux/FailingLooks.h"

#include <cerrno>
#include <memory>
#include <mutex>
#include <shared_mutex>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>

namespace mirabel {
namespace {

std::shared_mutex mutex;
FailingLooks::Decide decision;

int decide(int directory, const char* name) {
  const std::shared_lock lock(mutex);
  return decision ? decision(directory, name) : 0;
}

}  // namespace

FailingLooks::FailingLooks(Decide decide) {
  const std::unique_lock lock(mutex);
  decision = std::move(decide);
}

FailingLooks::~FailingLooks() {
  const std::unique_lock lock(mutex);
  decision = nullptr;
}

}  // namespace mirabel

// In the place of the C library's.
extern "C" int statx(int directory, const char* __restrict name, int flags, unsigned mask,
                     struct statx* __restrict buffer) noexcept {
  if (const int failure = mirabel::decide(directory, name); failure != 0) {
    errno = failure;
    return -1;
  }
  return static_cast<int>(::syscall(SYS_statx, directory, name, flags, mask, buffer));
}
