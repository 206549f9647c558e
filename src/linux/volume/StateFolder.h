#pragma once

#include <chrono>
#include <functional>
#include <string>
#include <string_view>

#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The folder in which the program keeps what it knows of one volume, held under a lock: as long
/// as this object lives, no other process has it.
class StateFolder {
 public:
  /// Makes what is missing below `base` (mode 0700) and takes the lock of the volume's folder.
  /// `waiting` is told once when another process has it. Errors: POSIX EBUSY when that process
  /// still had it at the end of `timeout`; EPERM when a folder is a symbolic link, is no folder
  /// or belongs to somebody else; others as they come. Nothing is changed when it fails.
  [[nodiscard]] static Result<StateFolder> acquire(
      const std::string& base, const UUID& volume, std::chrono::milliseconds timeout,
      const std::function<void(std::string_view)>& waiting);

  [[nodiscard]] const std::string& path() const { return path_; }
  /// Whether the folder that is held is still the one at its path: another process that opens that
  /// would have a state of its own.
  [[nodiscard]] bool isInPlace() const;
  [[nodiscard]] int descriptor() const { return folder_.get(); }
  [[nodiscard]] std::string file(std::string_view name) const {
    return path_ + "/" + std::string(name);
  }

 private:
  StateFolder(std::string path, UniqueFd folder, UniqueFd lock)
      : path_(std::move(path)), folder_(std::move(folder)), lock_(std::move(lock)) {}
  std::string path_;
  UniqueFd folder_;
  UniqueFd lock_;
};

}  // namespace mirabel
