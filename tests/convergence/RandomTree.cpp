#include "convergence/RandomTree.h"

#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <stdio.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

void writeFile(const std::string& path, std::size_t size, std::ios::openmode mode) {
  const auto status = fs::symlink_status(path);
  if (fs::exists(status) && !fs::is_regular_file(status)) return;
  std::ofstream file(path, mode | std::ios::binary);
  file << std::string(size, 'x');
}

}  // namespace

std::vector<std::string> RandomTree::all(bool folders) const {
  std::vector<std::string> result;
  if (folders) result.push_back(root_);
  for (const auto& entry : fs::recursive_directory_iterator(root_)) {
    if (fs::is_directory(entry.symlink_status()) == folders) result.push_back(entry.path());
  }
  std::ranges::sort(result);
  return result;
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
  if (!fs::is_regular_file(fs::symlink_status(path))) return;
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

std::string RandomTree::change() {
  const std::size_t kind = pick(17);
  const std::string file = any(false), folder = any(true), to = anyName();
  const bool isRoot = folder == root_;
  switch (kind) {
    case 0:
    case 1:
      writeFile(to, pick(60), std::ios::trunc);
      return "write " + to;
    case 2:
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
      if (!isRoot) ::rename(folder.c_str(), to.c_str());
      return "rename folder " + folder + " to " + to;
    case 7:
      ::unlink(file.c_str());
      return "unlink " + file;
    case 8:
      if (!isRoot && pick(3) == 0) fs::remove_all(folder);
      return "maybe remove tree " + folder;
    case 9:
      static_cast<void>(::symlink("nowhere", to.c_str()));
      return "symlink " + to;
    case 10:
      ::renameat2(AT_FDCWD, file.c_str(), AT_FDCWD, to.c_str(), RENAME_EXCHANGE);
      return "exchange " + file + " and " + to;
    case 11:
      ::chmod(file.c_str(), pick(2) == 0 ? 0400 : 0644);
      return "chmod " + file;
    case 12:
      ::lsetxattr(file.c_str(), "user.com.norvane.favorite-rank.number#PS", "x", pick(2), 0);
      return "setxattr " + file;
    case 13: {
      const std::size_t way = pick(3);
      save(file, way);
      return "save " + file + " way " + std::to_string(way);
    }
    case 14: {
      const std::string out = outside_ + "/" + std::to_string(pick(3));
      ::rename((pick(2) == 0 && !isRoot ? folder : file).c_str(), out.c_str());
      return "move out " + folder + " or " + file;
    }
    case 15:
      ::rename((outside_ + "/" + std::to_string(pick(3))).c_str(), to.c_str());
      return "move in " + to;
    default: {
      const std::string folderTo =
          fs::path(folder).parent_path() / (pick(2) == 0 ? "kind.quill" : "kind");
      if (!isRoot) ::rename(folder.c_str(), folderTo.c_str());
      return "rename folder " + folder + " to " + folderTo;
    }
  }
}

}  // namespace mirabel::testing
