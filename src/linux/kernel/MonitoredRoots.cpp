#include "linux/kernel/MonitoredRoots.h"

#include <atomic>
#include <cerrno>
#include <deque>
#include <fcntl.h>
#include <mutex>
#include <utility>

#include "foundation/LookFailure.h"
#include "linux/kernel/ClosedFolders.h"
#include "linux/kernel/ObjectStatus.h"

namespace mirabel {
namespace {

// How a further root is reached: it may lie on any mount, but behind no symbolic link.
constexpr unsigned long long withoutLinks = RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;

bool holds(std::string_view root, std::string_view path) {
  if (!path.starts_with(root)) return false;
  return path.size() == root.size() || root == "/" || path[root.size()] == '/';
}

std::string_view below(std::string_view root, std::string_view path) {
  std::string_view relative = path.substr(root.size());
  if (relative.starts_with('/')) relative.remove_prefix(1);
  return relative;
}

Result<UniqueFd> openBelow(int root, std::uint64_t device, const std::string& relative, int flags) {
  auto opened = openLongPath(root, relative, flags, resolveBeneath);
  if (!opened || relative.empty()) return opened;
  // A subvolume is no mount to the kernel, and gives out inode numbers of the root's once more.
  const auto status = statusAt(opened->get(), "");
  if (!status) return fail(status.error());
  if (status->device != device) return fail(Error::posix(EXDEV));
  const bool isRead = status->kind == FileKind::folder && (flags & O_PATH) == 0;
  if (leadsThroughClosed(root, relative) || (isRead && isClosed(opened->get()))) {
    return fail(Error::posix(EACCES));
  }
  return opened;
}

// The file system of the folder, or of the one that it would be made in where it is missing.
Result<std::uint64_t> fileSystemFor(std::string path) {
  while (true) {
    const auto opened = openLongPath(AT_FDCWD, path, O_PATH | O_DIRECTORY);
    const auto status = opened ? statusAt(opened->get(), "") : fail(opened.error());
    if (status) return status->device;
    if (!saysAbsent(status.error()) || path == "/") return fail(status.error());
    path = splitPath(path).parent;
    if (path.empty()) path = "/";
  }
}

// A dead mount is another's to whoever meets one; to those who look for the document storage it is
// what the answer has to wait for.
int errnoOf(const Error& error) {
  return error.isPosix(EXDEV) ? EREMOTEIO : static_cast<int>(error.code);
}

}  // namespace

/// What is at a root's path now.
struct MonitoredRoots::Root {
  enum class Kept { open, closed };
  Root(std::string where, std::uint64_t given, Kept kept)
      : path(std::move(where)), number(given), isKeptOpen(kept == Kept::open) {}

  const std::string path;
  const std::uint64_t number;
  const bool isKeptOpen;
  // Written by `refresh` alone. Whoever reads a descriptor that is replaced at that moment may use
  // it a little longer, so former ones are closed some changes later.
  std::atomic<bool> isThere = false;
  // Of the last look, where that says nothing: what is not there is then not known to be missing.
  std::atomic<int> failure = 0;
  // Of one that is kept open: where it lies for good; 0 until that is known.
  std::atomic<std::uint64_t> volume = 0;
  std::atomic<int> descriptor = -1;
  std::atomic<std::uint64_t> device = 0;
  std::atomic<std::uint64_t> inode = 0;
  // Of one that is not kept open, and need not be watched: nobody else tells when that changes.
  std::atomic<bool> isReadable = false;
  UniqueFd current{};
  std::deque<UniqueFd> former{};

  void take(UniqueFd opened, const std::optional<ObjectStatus>& status) {
    constexpr std::size_t mostFormer = 8;
    inode = status ? status->inode : 0;
    device = status ? status->device : 0;
    isThere = status.has_value();
    if (!isKeptOpen) return;
    descriptor = opened.get();
    former.push_back(std::exchange(current, std::move(opened)));
    if (former.size() > mostFormer) former.pop_front();
  }
};

MonitoredRoots::MonitoredRoots(std::vector<std::string> paths)
    : firstPath_(paths.empty() ? std::string() : std::move(paths.front())),
      first_(std::make_shared<Root>(firstPath_, 0, Root::Kept::open)) {
  static_cast<void>(refresh(*first_));  // what it could not see is asked for, see `isFirstThere`
  if (!paths.empty()) setFurther({paths.begin() + 1, paths.end()});
}

MonitoredRoots::~MonitoredRoots() = default;

void MonitoredRoots::setFurther(const std::vector<std::string>& paths) {
  decltype(furtherByPath_) byPath;
  std::vector<RootPointer> roots;
  roots.reserve(paths.size());
  const std::unique_lock lock(mutex_);
  for (const std::string& path : paths) {
    if (path == firstPath_ || byPath.contains(path)) continue;
    const auto known = furtherByPath_.find(path);
    RootPointer root = known != furtherByPath_.end()
                           ? known->second
                           : std::make_shared<Root>(path, nextNumber_++, Root::Kept::closed);
    if (known == furtherByPath_.end()) static_cast<void>(refresh(*root));
    byPath.emplace(path, root);
    roots.push_back(std::move(root));
  }
  further_ = std::move(roots);
  furtherByPath_ = std::move(byPath);
}

std::vector<MonitoredRoots::RootPointer> MonitoredRoots::all() const {
  const std::shared_lock lock(mutex_);
  std::vector<RootPointer> roots{first_};
  roots.insert(roots.end(), further_.begin(), further_.end());
  return roots;
}

MonitoredRoots::Changes MonitoredRoots::refresh() {
  Changes changes;
  for (const RootPointer& root : all()) {
    if (!refresh(*root)) continue;
    if (root == first_) changes.isFirst = true;
    if (root != first_) changes.further.push_back(root->path);
  }
  return changes;
}

bool MonitoredRoots::refresh(Root& root) {
  const auto resolve = root.isKeptOpen ? 0 : withoutLinks;
  auto opened = openLongPath(AT_FDCWD, root.path, O_PATH | O_DIRECTORY, resolve);
  const auto status = opened ? statusAt(opened->get(), "") : fail(opened.error());
  auto volume = status ? Result<std::uint64_t>(status->device) : fail(status.error());
  if (root.isKeptOpen && !status && saysAbsent(status.error())) volume = fileSystemFor(root.path);
  // The document storage itself may be mounted, from a server that does not answer just now, or a
  // folder above it be closed: it is there all the same.
  const bool isSilent =
      !volume && root.isKeptOpen && lookFailure(volume.error()) == LookFailure::closed;
  const bool saysNothing = isSilent || (!volume && !saysOutOfReach(volume.error()));
  if (!status && !root.isThere) root.failure = saysNothing ? errnoOf(volume.error()) : 0;
  if (saysNothing) return false;
  if (root.isKeptOpen && volume) {
    if (root.volume == 0) root.volume = *volume;
    // Neither are another volume's files to be seen here, nor those of this one to be missed.
    if (*volume != root.volume) return false;
  }
  const bool isSame =
      status ? root.isThere && status->inode == root.inode && status->device == root.device
             : !root.isThere;
  const bool isReadable = status && !root.isKeptOpen && !isClosed(opened->get());
  const bool wasReadable = root.isReadable.exchange(isReadable);
  if (isSame && isReadable == wasReadable) return false;
  root.take(status ? std::move(*opened) : UniqueFd(),
            status ? std::optional(*status) : std::nullopt);
  root.failure = 0;  // after the descriptor, see `open`
  return true;
}

// Of nested roots the innermost one owns the path.
MonitoredRoots::RootPointer MonitoredRoots::holderOf(std::string_view path) const {
  const bool isInFirst = holds(firstPath_, path);
  const std::shared_lock lock(mutex_);
  if (furtherByPath_.empty()) return isInFirst ? first_ : nullptr;
  for (std::string_view above = path; !above.empty();) {
    if (isInFirst && above.size() == firstPath_.size()) return first_;
    const auto found = furtherByPath_.find(above);
    if (found != furtherByPath_.end()) return found->second;
    const std::size_t slash = above.rfind('/');
    above = slash == std::string_view::npos ? std::string_view() : above.substr(0, slash);
  }
  return isInFirst ? first_ : nullptr;
}

std::optional<MonitoredRoots::Place> MonitoredRoots::locate(std::string_view path) const {
  const RootPointer root = holderOf(path);
  if (!root) return std::nullopt;
  return Place{root->number, path.substr(0, root->path.size()), below(root->path, path)};
}

std::vector<std::string> MonitoredRoots::paths() const {
  std::vector<std::string> paths;
  for (const RootPointer& root : all())
    paths.push_back(root->path);
  return paths;
}

bool MonitoredRoots::isThere(std::string_view rootPath) const {
  const RootPointer root = holderOf(rootPath);
  return root && root->path == rootPath && root->isThere;
}

Result<std::uint64_t> MonitoredRoots::volume() const {
  if (const int failure = first_->failure; failure != 0) return fail(Error::posix(failure));
  const std::uint64_t volume = first_->volume;
  if (volume == 0) return fail(Error::posix(EACCES));
  return volume;
}

bool MonitoredRoots::hasLeftVolume() const {
  const std::uint64_t volume = first_->volume;
  if (volume == 0) return false;
  // One system call, as long as nothing has happened.
  if (const auto seen = statusOf(firstPath_); seen && seen->device == volume) return false;
  const auto now = fileSystemFor(firstPath_);
  return now && *now != volume;
}

Result<UniqueFd> MonitoredRoots::open(const std::string& path, int flags) const {
  if (path.find('\0') != std::string::npos) return fail(Error::posix(EINVAL));
  const int allFlags = flags | ((flags & O_PATH) != 0 ? 0 : O_NONBLOCK | O_NOCTTY);
  const RootPointer root = holderOf(path);
  if (!root) return openLongPath(AT_FDCWD, path, allFlags);
  const std::string relative(below(root->path, path));
  if (root->isKeptOpen) {
    const int failure = root->failure;
    if (root->descriptor < 0) return fail(Error::posix(failure != 0 ? failure : ENOENT));
    if (isClosed(root->descriptor)) return fail(closedStorage(root->path));
    return openBelow(root->descriptor, root->device, relative, allFlags);
  }
  // Whatever folder is there by now: whose it is, is for those to say who look into it.
  auto folder = openLongPath(AT_FDCWD, root->path, O_PATH | O_DIRECTORY, withoutLinks);
  if (!folder) return fail(folder.error());
  const auto status = statusAt(folder->get(), "");
  if (!status) return fail(status.error());
  if (relative.empty() && (flags & O_PATH) != 0) return folder;
  if (isClosed(folder->get())) return fail(Error::posix(EACCES));
  return openBelow(folder->get(), status->device, relative, allFlags);
}

Result<UniqueFd> MonitoredRoots::openHolder(const std::string& path) const {
  auto folder = open(path, O_PATH | O_DIRECTORY);
  const bool isOfRoot = path != firstPath_ && locate(path);
  if (folder && isOfRoot && isClosed(folder->get())) return fail(Error::posix(EACCES));
  return folder;
}

}  // namespace mirabel
