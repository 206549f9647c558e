#include "BenchTree.h"

#include <algorithm>
#include <array>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "BenchHome.h"

namespace mirabel::bench {
namespace {

constexpr std::size_t blockSize = 4096;

void writeBlock(const std::string& path, int flags) {
  static const std::array<char, blockSize> block{};
  const int fd = ::open(path.c_str(), O_WRONLY | O_CLOEXEC | flags, 0644);
  require(fd >= 0, "a file can be opened for writing");
  require(::write(fd, block.data(), block.size()) == std::ssize(block), "a file can be written");
  ::close(fd);
}

}  // namespace

void BenchTree::make() const {
  for (std::size_t number = 0; number < folders_; ++number) {
    require(::mkdir(folder(number).c_str(), 0755) == 0, "a folder can be made");
  }
  for (std::size_t number = 0; number < files_; ++number)
    writeBlock(file(number), O_CREAT | O_EXCL);
}

std::string BenchTree::folder(std::size_t number) const {
  const std::size_t first = std::max<std::size_t>(2, folders_ / 250);
  const std::size_t second = std::max(first + 1, folders_ / 10);
  if (number < first) return root_ + "/area " + std::to_string(number);
  if (number < second) return folder(number % first) + "/part " + std::to_string(number);
  const std::size_t above = first + (number - second) % (second - first);
  return folder(above) + "/collection " + std::to_string(number);
}

std::string BenchTree::file(std::size_t number) const {
  return folder(number % folders_) + "/document " + std::to_string(number) + ".txt";
}

void BenchTree::rewrite(std::size_t number) const {
  writeBlock(file(number), 0);
}

std::size_t plainPass(const std::string& root) {
  struct Entry {
    std::uint64_t inode;
    std::int64_t position;
    unsigned short length;
    unsigned char type;
    char name[1];
  };
  std::vector<std::string> folders{root};
  std::array<char, 32 << 10> buffer;
  std::size_t count = 0;
  while (!folders.empty()) {
    const std::string path = std::move(folders.back());
    folders.pop_back();
    const int folder = ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    require(folder >= 0, "a folder can be read");
    while (true) {
      const long filled = ::syscall(SYS_getdents64, folder, buffer.data(), buffer.size());
      if (filled <= 0) break;
      for (long at = 0; at < filled;) {
        const auto* entry = reinterpret_cast<const Entry*>(buffer.data() + at);
        at += entry->length;
        const std::string_view name = entry->name;
        if (name == "." || name == "..") continue;
        struct statx status;
        require(::statx(folder, entry->name, AT_SYMLINK_NOFOLLOW, STATX_BASIC_STATS | STATX_BTIME,
                        &status) == 0,
                "each entry has a status");
        ++count;
        if (S_ISDIR(status.stx_mode)) folders.push_back(path + "/" + entry->name);
      }
    }
    ::close(folder);
  }
  return count;
}

}  // namespace mirabel::bench
