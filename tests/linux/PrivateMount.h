#pragma once

#include <gtest/gtest.h>
#include <sched.h>
#include <string>
#include <sys/mount.h>
#include <utility>

namespace mirabel {

/// An empty file system over a folder, seen by this process alone, while this is there. Files that
/// were open before belong to the mounts of before.
class PrivateMount {
 public:
  explicit PrivateMount(std::string folder) : folder_(std::move(folder)) {
    isThere_ = ::unshare(CLONE_NEWNS) == 0 &&
               ::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
               ::mount("none", folder_.c_str(), "tmpfs", 0, nullptr) == 0;
  }
  ~PrivateMount() { EXPECT_TRUE(!isThere_ || ::umount2(folder_.c_str(), MNT_DETACH) == 0); }
  PrivateMount(const PrivateMount&) = delete;
  PrivateMount& operator=(const PrivateMount&) = delete;

  /// Not where this process may not mount.
  [[nodiscard]] bool isThere() const { return isThere_; }

 private:
  std::string folder_;
  bool isThere_ = false;
};

}  // namespace mirabel
