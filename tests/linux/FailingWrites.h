#pragma once

#include <cerrno>
#include <cstddef>
#include <sqlite3.h>
#include <string>
#include <unistd.h>
#include <utility>

namespace mirabel {

/// While it lives, what SQLite writes fails: always, or for as long as that file is there.
class FailingWrites {
 public:
  explicit FailingWrites(int error, std::string whileThere = "") {
    error_ = error;
    file_ = std::move(whileThere);
    set(reinterpret_cast<sqlite3_syscall_ptr>(&fail));
  }
  ~FailingWrites() { set(nullptr); }
  FailingWrites(const FailingWrites&) = delete;
  FailingWrites& operator=(const FailingWrites&) = delete;

 private:
  static ssize_t fail(int file, const void* bytes, std::size_t count, off_t offset) {
    const bool isPast = !file_.empty() && ::access(file_.c_str(), F_OK) != 0;
    if (isPast) return ::pwrite(file, bytes, count, offset);
    errno = error_;
    return -1;
  }
  static void set(sqlite3_syscall_ptr call) {
    sqlite3_vfs* files = sqlite3_vfs_find(nullptr);
    for (const char* name : {"pwrite", "pwrite64"})
      files->xSetSystemCall(files, name, call);
  }

  static inline int error_ = 0;
  static inline std::string file_;
};

}  // namespace mirabel
