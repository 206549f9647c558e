#include "convergence/RandomTree.h"

#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

// Of what lies in a closed folder nothing is known.
fs::file_status statusOf(const std::string& path) {
  std::error_code closed;
  return fs::symlink_status(path, closed);
}

void writeFile(const std::string& path, std::size_t size, std::ios::openmode mode) {
  const auto status = statusOf(path);
  if (fs::exists(status) && !fs::is_regular_file(status)) return;
  std::ofstream file(path, mode | std::ios::binary);
  file << std::string(size, 'x');
}

std::uint64_t inodeOf(const std::string& path) {
  struct stat status {};
  return ::lstat(path.c_str(), &status) == 0 ? status.st_ino : 0;
}

}  // namespace

std::vector<std::string> RandomTree::all(bool folders) const {
  std::vector<std::string> roots{root_}, result;
  std::ranges::copy_if(others_, std::back_inserter(roots),
                       [](const std::string& other) { return fs::is_directory(statusOf(other)); });
  for (const std::string& root : roots) {
    if (folders) result.push_back(root);
    constexpr auto closedHoldNothing = fs::directory_options::skip_permission_denied;
    for (const auto& entry : fs::recursive_directory_iterator(root, closedHoldNothing)) {
      std::error_code hidden;
      const bool isFolder = !entry.is_symlink(hidden) && entry.is_directory(hidden);
      if (isFolder == folders) result.push_back(entry.path());
    }
  }
  std::ranges::sort(result);
  return result;
}

bool RandomTree::isShown(const std::string& path) const {
  return std::ranges::none_of(others_, [&](const std::string& other) {
    return (path + "/").starts_with(other + "/") && !isPresented_(other);
  });
}

std::set<std::uint64_t> RandomTree::shownFolders() const {
  std::set<std::uint64_t> shown;
  for (const std::string& folder : all(true))
    if (isShown(folder) && isOpen(folder)) shown.insert(inodeOf(folder));
  return shown;
}

bool RandomTree::isOpen(const std::string& folder) {
  return ::faccessat(AT_FDCWD, folder.c_str(), R_OK | X_OK, AT_EACCESS) == 0;
}

void RandomTree::openAll(const std::string& folder) {
  ::chmod(folder.c_str(), 0755);
  for (const auto& entry : fs::directory_iterator(folder))
    if (!entry.is_symlink() && entry.is_directory()) openAll(entry.path());
}

void RandomTree::noteFollowed() {
  followed_ = shownFolders();
}

void RandomTree::noteWriting(const std::string& file) {
  struct stat status {};
  if (::stat(file.c_str(), &status) != 0 || status.st_nlink < 2) return;
  const fs::path place(file);
  const std::uint64_t folder = inodeOf(place.parent_path());
  if (!followed_.contains(folder)) unheard_.push_back({status.st_ino, folder, place.filename()});
}

void RandomTree::makeUnheardHeard() {
  auto names = all(false);
  std::erase_if(names, [&](const std::string& name) { return !isShown(name); });
  for (const Written& written : std::exchange(unheard_, {})) {
    const auto isIt = [&](const std::string& name) { return inodeOf(name) == written.file; };
    const bool shows = std::ranges::any_of(names, [&](const std::string& name) {
      const fs::path place(name);
      return isIt(name) && place.filename() == written.name &&
             inodeOf(place.parent_path()) == written.folder;
    });
    const auto other = std::ranges::find_if(names, isIt);
    if (shows || other == names.end()) continue;
    ::utimensat(AT_FDCWD, other->c_str(), nullptr, AT_SYMLINK_NOFOLLOW);
  }
}

bool RandomTree::isRoot(const std::string& folder) const {
  return folder == root_ || std::ranges::find(others_, folder) != others_.end();
}

std::string RandomTree::any(bool folders) {
  const auto names = all(folders);
  return names.empty() ? root_ + "/none" : names[pick(names.size())];
}

std::string RandomTree::anyName() {
  static constexpr const char* names[] = {"a.txt",   "b.txt",     "b.txt~", ".hidden", "Inbox",
                                          "d.quill", "e.package", "folder", "g",       ".Trash"};
  return any(true) + "/" + names[pick(std::size(names))];
}

// The ways in which editors save.
void RandomTree::save(const std::string& path, std::size_t way) {
  // Where the file can't be put aside, it is written over.
  if (!fs::is_regular_file(statusOf(path))) return;
  noteWriting(path);
  const std::string temporary = fs::path(path).parent_path() / ".save.tmp";
  const std::string backup = path + "~";
  switch (way) {
    case 0:
      writeFile(temporary, pick(60), std::ios::trunc);
      ::rename(temporary.c_str(), path.c_str());
      return;
    case 1:
      ::rename(path.c_str(), backup.c_str());
      writeFile(path, pick(60), std::ios::trunc);
      return;
    default:
      writeFile(temporary, pick(60), std::ios::trunc);
      ::renameat2(AT_FDCWD, temporary.c_str(), AT_FDCWD, path.c_str(), RENAME_EXCHANGE);
      ::unlink(temporary.c_str());
  }
}

// A file that had no name is given one, which must be free.
void RandomTree::linkNameless(const std::string& to) {
  const int file = ::open(root_.c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0644);
  if (file < 0) return;
  const std::string contents(pick(60), 'x');
  static_cast<void>(::write(file, contents.data(), contents.size()));
  const std::string nameless = "/proc/self/fd/" + std::to_string(file);
  ::linkat(AT_FDCWD, nameless.c_str(), AT_FDCWD, to.c_str(), AT_SYMLINK_FOLLOW);
  ::close(file);
}

// A further name for the file: beside it, anywhere, over another file, or outside and back.
std::string RandomTree::link(const std::string& file, const std::string& to) {
  const std::string beside = fs::path(file).parent_path() / fs::path(to).filename();
  const std::string out = outside_ + "/" + std::to_string(pick(3));
  switch (pick(7)) {
    case 0:
      ::link(file.c_str(), beside.c_str());
      return "link " + file + " to " + beside;
    case 1: {
      const std::string over = any(false), temporary = root_ + "/.link.tmp";
      ::link(file.c_str(), temporary.c_str());
      ::rename(temporary.c_str(), over.c_str());
      ::unlink(temporary.c_str());
      return "link " + file + " over " + over;
    }
    case 2:
      ::link(file.c_str(), out.c_str());
      return "link " + file + " to " + out;
    case 3:
      ::link(out.c_str(), to.c_str());
      return "link " + out + " to " + to;
    case 4:
      linkNameless(to);
      return "link a nameless file to " + to;
    default:
      ::link(file.c_str(), to.c_str());
      return "link " + file + " to " + to;
  }
}

std::string RandomTree::anyLinked() {
  auto names = all(false);
  std::erase_if(names, [](const std::string& name) {
    struct stat status {};
    return ::lstat(name.c_str(), &status) != 0 || status.st_nlink < 2;
  });
  return names.empty() ? any(false) : names[pick(names.size())];
}

// What is done to one of several names.
std::string RandomTree::changeLinked(const std::string& to) {
  const std::string file = anyLinked();
  switch (pick(5)) {
    case 0:
      noteWriting(file);
      writeFile(file, pick(9) + 1, std::ios::app);
      return "append linked " + file;
    case 1:
      ::rename(file.c_str(), to.c_str());
      return "rename linked " + file + " to " + to;
    case 2: {
      const std::size_t way = pick(3);
      save(file, way);
      return "save linked " + file + " way " + std::to_string(way);
    }
    default:
      ::unlink(file.c_str());
      return "unlink linked " + file;
  }
}

// Half of the time it is opened again, or most of the tree would soon be out of everybody's sight.
std::string RandomTree::changeMode(const std::string& folder) {
  static constexpr mode_t modes[] = {0,    0111, 0300, 0311, 0400, 0444, 0555, 0600, 0644,
                                     0755, 0755, 0755, 0755, 0755, 0755, 0755, 0755};
  const mode_t mode = modes[pick(std::size(modes))];
  if (folder == root_) return "no other mode for " + folder;
  ::chmod(folder.c_str(), mode);
  std::ostringstream text;
  text << "chmod " << std::oct << mode << " " << folder;
  return text.str();
}

std::string RandomTree::change() {
  const std::size_t kind = pick(24);
  const std::string file = any(false), folder = any(true), to = anyName();
  const bool isFixed = isRoot(folder);
  // What leaves is not followed when it comes back.
  const auto shown = shownFolders();
  std::erase_if(followed_, [&](std::uint64_t id) { return !shown.contains(id); });
  switch (kind) {
    case 0:
    case 1:
      noteWriting(to);
      writeFile(to, pick(60), std::ios::trunc);
      return "write " + to;
    case 2:
      noteWriting(file);
      if (file != root_ + "/none") writeFile(file, pick(9) + 1, std::ios::app);
      return "append " + file;
    case 3:
      ::mkdir(to.c_str(), 0755);
      return "mkdir " + to;
    case 4:
    case 5:
      ::rename(file.c_str(), to.c_str());
      return "rename " + file + " to " + to;
    case 6:
      if (!isFixed) ::rename(folder.c_str(), to.c_str());
      return "rename folder " + folder + " to " + to;
    case 7:
      ::unlink(file.c_str());
      return "unlink " + file;
    case 8:
      if (std::error_code ignored; !isFixed && pick(3) == 0) fs::remove_all(folder, ignored);
      return "maybe remove tree " + folder;
    case 9:
      static_cast<void>(::symlink("nowhere", to.c_str()));
      return "symlink " + to;
    case 10:
      ::renameat2(AT_FDCWD, file.c_str(), AT_FDCWD, to.c_str(), RENAME_EXCHANGE);
      return "exchange " + file + " and " + to;
    case 11:
      noteWriting(file);
      ::chmod(file.c_str(), pick(2) == 0 ? 0400 : 0644);
      return "chmod " + file;
    case 12:
      noteWriting(file);
      ::lsetxattr(file.c_str(), "user.com.norvane.favorite-rank.number#PS", "x", pick(2), 0);
      return "setxattr " + file;
    case 13: {
      const std::size_t way = pick(3);
      save(file, way);
      return "save " + file + " way " + std::to_string(way);
    }
    case 14: {
      const std::string out = outside_ + "/" + std::to_string(pick(3));
      ::rename((pick(2) == 0 && !isFixed ? folder : file).c_str(), out.c_str());
      return "move out " + folder + " or " + file;
    }
    case 15:
      ::rename((outside_ + "/" + std::to_string(pick(3))).c_str(), to.c_str());
      return "move in " + to;
    case 16:
    case 17:
    case 18:
      return link(file, to);
    case 19:
    case 20:
      return changeLinked(to);
    case 21:
    case 22:
      return changeMode(folder);
    default: {
      const std::string folderTo =
          fs::path(folder).parent_path() / (pick(2) == 0 ? "kind.quill" : "kind");
      if (!isFixed) ::rename(folder.c_str(), folderTo.c_str());
      return "rename folder " + folder + " to " + folderTo;
    }
  }
}

}  // namespace mirabel::testing
