#include "linux/volume/StateFolder.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>

namespace mirabel {
namespace {

Error refused(const std::string& path, std::string_view why) {
  return Error::posix(EPERM, "the state folder \"" + path + "\" " + std::string(why));
}

// Opens `path`, making it and its parents where they are missing. Only the last component must
// not be a symbolic link: what lies above it is the user's to arrange.
Result<UniqueFd> openFolder(const std::string& path) {
  UniqueFd folder(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (folder) return folder;
  if (errno == ELOOP || errno == ENOTDIR) {
    struct stat status {};
    if (::lstat(path.c_str(), &status) != 0) return fail(Error::posix(ENOTDIR, path));
    return fail(refused(
        path, S_ISLNK(status.st_mode) ? "is a symbolic link; move it away" : "is no folder"));
  }
  if (errno != ENOENT) return fail(Error::posix(errno, path));
  const std::size_t slash = path.rfind('/');
  const std::string parent = slash == 0 ? "/" : path.substr(0, slash);
  struct stat status {};
  if (slash != std::string::npos && ::stat(parent.c_str(), &status) != 0) {
    if (auto made = openFolder(parent); !made) return fail(made.error());
  }
  if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) return fail(Error::posix(errno, path));
  // What is synchronised in there later is lost with a folder that is not on disk itself.
  const UniqueFd above(::open(parent.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (above && ::fsync(above.get()) != 0) return fail(Error::posix(errno, path));
  folder.reset(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!folder) return fail(Error::posix(errno, path));
  return folder;
}

Result<UniqueFd> openOwnFolder(const std::string& path) {
  auto folder = openFolder(path);
  if (!folder) return folder;
  struct stat status {};
  if (::fstat(folder->get(), &status) != 0) return fail(Error::posix(errno, path));
  if (status.st_uid != ::geteuid())
    return fail(refused(path, "belongs to somebody else; have it given back, or move it away"));
  if ((status.st_mode & 077) != 0 && ::fchmod(folder->get(), 0700) != 0) {
    return fail(Error::posix(errno, path));
  }
  return folder;
}

Result<void> lock(int file, std::chrono::milliseconds timeout,
                  const std::function<void()>& waiting) {
  using Clock = std::chrono::steady_clock;
  const auto deadline = Clock::now() + timeout;
  bool told = false;
  while (::flock(file, LOCK_EX | LOCK_NB) != 0) {
    if (errno == EINTR) continue;
    if (errno != EWOULDBLOCK) return fail(Error::posix(errno));
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now());
    if (left.count() <= 0) {
      return fail(Error::posix(EBUSY, "another process is using this volume's state"));
    }
    if (!told && waiting) waiting();
    told = true;
    std::this_thread::sleep_for(std::min(left, std::chrono::milliseconds(20)));
  }
  return {};
}

}  // namespace

bool StateFolder::isInPlace() const {
  struct stat held {};
  struct stat there {};
  if (::fstat(lock_.get(), &held) != 0) return true;
  const int looked = ::lstat(file("lock").c_str(), &there);
  if (looked != 0) return errno != ENOENT && errno != ENOTDIR;
  return there.st_ino == held.st_ino && there.st_dev == held.st_dev;
}

Result<StateFolder> StateFolder::acquire(const std::string& base, const UUID& volume,
                                         std::chrono::milliseconds timeout,
                                         const std::function<void(std::string_view)>& waiting) {
  auto own = openOwnFolder(base);
  if (!own) return fail(own.error());
  std::string path = base + "/" + volume.description();
  auto folder = openOwnFolder(path);
  if (!folder) return fail(folder.error());
  UniqueFd file(::openat(folder->get(), "lock", O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!file) return fail(Error::posix(errno, path + "/lock"));
  auto locked = lock(file.get(), timeout, [&] {
    if (waiting) waiting("waiting for another process that is using this volume");
  });
  if (!locked) return fail(locked.error());
  return StateFolder(std::move(path), std::move(*folder), std::move(file));
}

}  // namespace mirabel
