#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <utility>
#include <vector>

#include "linux/kernel/ObjectStatus.h"
#include "mirabel/Error.h"
#include "mirabel/UniqueFd.h"
#include "mirabel/Values.h"

namespace mirabel {

/// The steps that operations are made of, nearly all of them one system call. They go through here,
/// so that a test can have any one of them fail, or do something just before it. What lies within a
/// step (copying contents, replacing the record of pending work, making the folders of a path)
/// calls the system by itself. Errors are POSIX errors. Any thread.
class FileCalls {
 public:
  /// Asked before each call, with its name; the errno that it has to fail with, 0 to go on.
  using Check = std::function<int(std::string_view call)>;
  explicit FileCalls(Check check = {}) : check_(std::move(check)) {}

  /// Opens `name` in `folder`; O_NOFOLLOW, O_CLOEXEC, O_NONBLOCK and O_NOCTTY are added.
  [[nodiscard]] Result<UniqueFd> open(int folder, const std::string& name, int flags,
                                      mode_t mode = 0) const;
  /// Opens what lies at `path` below `top`; no symbolic link on the way is followed, nothing leads
  /// out. An empty path is `top` itself.
  enum class Mounts { entered, refused };
  [[nodiscard]] Result<UniqueFd> openBelow(int top, const std::string& path, int flags,
                                           Mounts mounts) const;
  /// Opens the object that a descriptor holds, O_PATH ones among them, anew.
  [[nodiscard]] Result<UniqueFd> reopen(int object, int flags) const;
  /// See `statusAt`.
  [[nodiscard]] Result<ObjectStatus> status(int folder, const std::string& name = {}) const;
  [[nodiscard]] Result<void> makeFolder(int folder, const std::string& name, mode_t mode) const;
  /// Never replaces: EEXIST.
  [[nodiscard]] Result<void> rename(int fromFolder, const std::string& from, int toFolder,
                                    const std::string& to) const;
  /// AT_REMOVEDIR or 0.
  [[nodiscard]] Result<void> remove(int folder, const std::string& name, int flags) const;
  [[nodiscard]] Result<std::string> target(int folder, const std::string& name) const;
  [[nodiscard]] Result<void> makeLink(const std::string& target, int folder,
                                      const std::string& name) const;
  [[nodiscard]] Result<void> link(int fromFolder, const std::string& from, int toFolder,
                                  const std::string& to) const;
  /// A FIFO or a socket.
  [[nodiscard]] Result<void> makeNode(int folder, const std::string& name, mode_t mode) const;
  [[nodiscard]] Result<void> setMode(int file, mode_t mode) const;
  /// Of the last modification, in nanoseconds since 1970. An empty name is the descriptor's own
  /// object.
  [[nodiscard]] Result<void> setTime(int folder, const std::string& name,
                                     std::int64_t modificationTime) const;
  /// The attributes of users and the access control lists of what is open, under their full names.
  using Attributes = std::vector<std::pair<std::string, Data>>;
  [[nodiscard]] Result<Attributes> attributes(int file) const;
  [[nodiscard]] Result<void> setAttribute(int file, const std::string& name,
                                          const Data& value) const;
  /// Has the file and what names it on disk.
  [[nodiscard]] Result<void> sync(int file) const;
  /// Has the kernel begin to write the file's contents, so that `sync` finds little left to do.
  void beginWriting(int file) const;

  /// Whether this process may add entries to the open folder and take them away.
  [[nodiscard]] Result<void> mayChange(int folder) const;
  /// Any other call: the error that it has to fail with.
  [[nodiscard]] Result<void> check(std::string_view call) const;

 private:
  Check check_;
};

/// The path of an entry of a folder below the top of a tree, which is "".
[[nodiscard]] std::string pathBelow(const std::string& folder, const std::string& name);
/// The error, with the path below the top for people, unless it has one already.
[[nodiscard]] Error withPath(Error error, const std::string& path);

/// Reads the names in an open folder, "." and ".." left out, each with its DT_… type. The
/// descriptor is opened anew, so that it may be O_PATH and is read from the start.
struct FolderEntry {
  std::string name;
  unsigned char type;
};
[[nodiscard]] Result<std::vector<FolderEntry>> entriesOf(const FileCalls& calls, int folder);

}  // namespace mirabel
