#pragma once

#include <sys/resource.h>

namespace mirabel::testing {

/// While it lives, the process can open nothing more.
class NoDescriptors {
 public:
  /// Where a sanitizer needs descriptors of its own to tell a good object from a bad one.
#ifdef __SANITIZE_ADDRESS__
  static constexpr bool areNeeded = true;
#else
  static constexpr bool areNeeded = false;
#endif

  NoDescriptors() {
    ::getrlimit(RLIMIT_NOFILE, &before_);
    rlimit none = before_;
    none.rlim_cur = 0;
    ::setrlimit(RLIMIT_NOFILE, &none);
  }
  ~NoDescriptors() {
    ::setrlimit(RLIMIT_NOFILE, &before_);
  }
  NoDescriptors(const NoDescriptors&) = delete;
  NoDescriptors& operator=(const NoDescriptors&) = delete;

 private:
  rlimit before_{};
};

}  // namespace mirabel::testing
