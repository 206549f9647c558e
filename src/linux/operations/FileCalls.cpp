#include "linux/operations/FileCalls.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "linux/kernel/AttributeCalls.h"
#include "linux/kernel/LongPath.h"
#include "linux/kernel/RawDirectory.h"

namespace mirabel {
namespace {

constexpr int openFlags = O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY;

bool isKept(std::string_view attribute) {
  return attribute.starts_with(userAttributePrefix) || attribute.starts_with("system.posix_acl_");
}

Result<void> answer(long result) {
  if (result < 0) return fail(Error::posix(errno));
  return {};
}

}  // namespace

Result<void> FileCalls::check(std::string_view call) const {
  if (!check_) return {};
  const int failure = check_(call);
  if (failure != 0) return fail(Error::posix(failure));
  return {};
}

Result<UniqueFd> FileCalls::open(int folder, const std::string& name, int flags,
                                 mode_t mode) const {
  if (auto checked = check("open"); !checked) return fail(checked.error());
  UniqueFd opened(::openat(folder, name.c_str(), flags | openFlags, mode));
  if (!opened) return fail(Error::posix(errno));
  return opened;
}

Result<UniqueFd> FileCalls::openBelow(int top, const std::string& path, int flags,
                                      Mounts mounts) const {
  if (auto checked = check("open below"); !checked) return fail(checked.error());
  const auto resolve =
      mounts == Mounts::refused ? resolveBeneath : resolveBeneath & ~RESOLVE_NO_XDEV;
  return openLongPath(top, path, flags | ((flags & O_PATH) != 0 ? 0 : O_NONBLOCK | O_NOCTTY),
                      resolve);
}

Result<UniqueFd> FileCalls::reopen(int object, int flags) const {
  if (auto checked = check("reopen"); !checked) return fail(checked.error());
  const std::string path = "/proc/self/fd/" + std::to_string(object);
  UniqueFd opened(::open(path.c_str(), flags | (openFlags & ~O_NOFOLLOW)));
  if (!opened) return fail(Error::posix(errno));
  return opened;
}

Result<ObjectStatus> FileCalls::status(int folder, const std::string& name) const {
  if (auto checked = check("status"); !checked) return fail(checked.error());
  return statusAt(folder, name);
}

Result<void> FileCalls::makeFolder(int folder, const std::string& name, mode_t mode) const {
  if (auto checked = check("make folder"); !checked) return checked;
  return answer(::mkdirat(folder, name.c_str(), mode));
}

Result<void> FileCalls::rename(int fromFolder, const std::string& from, int toFolder,
                               const std::string& to) const {
  if (auto checked = check("rename"); !checked) return checked;
  return answer(
      ::syscall(SYS_renameat2, fromFolder, from.c_str(), toFolder, to.c_str(), RENAME_NOREPLACE));
}

Result<void> FileCalls::remove(int folder, const std::string& name, int flags) const {
  if (auto checked = check("remove"); !checked) return checked;
  return answer(::unlinkat(folder, name.c_str(), flags));
}

Result<std::string> FileCalls::target(int folder, const std::string& name) const {
  if (auto checked = check("read link"); !checked) return fail(checked.error());
  std::string text(PATH_MAX, '\0');
  const ssize_t length = ::readlinkat(folder, name.c_str(), text.data(), text.size());
  if (length < 0) return fail(Error::posix(errno));
  text.resize(static_cast<std::size_t>(length));
  return text;
}

Result<void> FileCalls::makeLink(const std::string& target, int folder,
                                 const std::string& name) const {
  if (auto checked = check("make link"); !checked) return checked;
  return answer(::symlinkat(target.c_str(), folder, name.c_str()));
}

Result<void> FileCalls::link(int fromFolder, const std::string& from, int toFolder,
                             const std::string& to) const {
  if (auto checked = check("link"); !checked) return checked;
  return answer(::linkat(fromFolder, from.c_str(), toFolder, to.c_str(), 0));
}

Result<void> FileCalls::makeNode(int folder, const std::string& name, mode_t mode) const {
  if (auto checked = check("make node"); !checked) return checked;
  return answer(::mknodat(folder, name.c_str(), mode, 0));
}

Result<void> FileCalls::setMode(int file, mode_t mode) const {
  if (auto checked = check("set mode"); !checked) return checked;
  return answer(::fchmod(file, mode));
}

Result<void> FileCalls::setTime(int folder, const std::string& name,
                                std::int64_t modificationTime) const {
  if (auto checked = check("set time"); !checked) return checked;
  timespec time{modificationTime / nanosecondsPerSecond, modificationTime % nanosecondsPerSecond};
  if (time.tv_nsec < 0) {
    time.tv_sec -= 1;
    time.tv_nsec += nanosecondsPerSecond;
  }
  const timespec times[] = {{0, UTIME_OMIT}, time};
  if (name.empty()) return answer(::futimens(folder, times));
  return answer(::utimensat(folder, name.c_str(), times, AT_SYMLINK_NOFOLLOW));
}

Result<FileCalls::Attributes> FileCalls::attributes(int file) const {
  if (auto checked = check("attributes"); !checked) return fail(checked.error());
  const std::string self;
  std::vector<char> buffer;
  const auto list = listAttributes(file, self, buffer);
  if (!list) return fail(list.error());
  Attributes attributes;
  for (std::string_view rest = *list; !rest.empty();) {
    const std::string name(rest.substr(0, rest.find('\0')));
    rest.remove_prefix(std::min(rest.size(), name.size() + 1));
    if (!isKept(name)) continue;
    const auto size = attributeSize(file, self, name);
    auto value = size ? readAttribute(file, self, name, *size) : fail(size.error());
    // Taken away since they were listed.
    if (!value && value.error().isPosix(ENODATA)) continue;
    if (!value) return fail(value.error());
    attributes.emplace_back(name, *std::move(value));
  }
  return attributes;
}

Result<void> FileCalls::setAttribute(int file, const std::string& name, const Data& value) const {
  if (auto checked = check("set attribute"); !checked) return checked;
  return answer(::fsetxattr(file, name.c_str(), value.data(), value.size(), 0));
}

Result<void> FileCalls::mayChange(int folder) const {
  if (auto checked = check("may change"); !checked) return checked;
  return answer(::faccessat(folder, ".", W_OK | X_OK, AT_EACCESS));
}

Result<void> FileCalls::sync(int file) const {
  if (auto checked = check("sync"); !checked) return checked;
  return answer(::fsync(file));
}

void FileCalls::beginWriting(int file) const {
  ::sync_file_range(file, 0, 0, SYNC_FILE_RANGE_WRITE);
}

std::string pathBelow(const std::string& folder, const std::string& name) {
  return folder.empty() ? name : folder + "/" + name;
}

Error withPath(Error error, const std::string& path) {
  if (!path.empty()) error.userInfo.emplace(errorkey::detail, path);
  return error;
}

Result<std::vector<FolderEntry>> entriesOf(const FileCalls& calls, int folder) {
  auto opened = calls.open(folder, ".", O_RDONLY | O_DIRECTORY);
  if (!opened) return fail(opened.error());
  if (auto checked = calls.check("read folder"); !checked) return fail(checked.error());
  RawDirectory directory(std::move(*opened), 256u << 10);
  std::vector<FolderEntry> entries;
  for (;;) {
    const auto entry = directory.next();
    if (!entry) return fail(entry.error());
    if (!*entry) return entries;
    if ((*entry)->name == "." || (*entry)->name == "..") continue;
    entries.push_back({std::string((*entry)->name), (*entry)->type});
  }
}

}  // namespace mirabel
