// One folder of 100,000 files: what a full listing costs beside the system calls that it cannot do
// without. The plain loop reads the folder and makes one statx and one listxattr for each entry,
// relative to the open folder, and keeps nothing.
#include <array>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <limits>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

#include "BenchHome.h"
#include "fs/FSDirectoryEnumerator.h"
#include "items/ItemBatch.h"
#include "linux/files/LinuxPlatform.h"
#include "provider/LocalVessel.h"

namespace mirabel::bench {
namespace {

constexpr std::size_t batchSize = 10000;
constexpr const char* firstSightRow = "full items on first sight / statx + listxattr";
constexpr const char* knownRow = "full items when known / statx + listxattr";
constexpr const char* walkerRow = "walker alone / getdents64";
constexpr const char* memoryRow = "resident memory, small folder then large";

struct LinuxEntry {
  std::uint64_t inode;
  std::int64_t position;
  unsigned short length;
  unsigned char type;
  char name[1];
};

enum class Each { nothing, statAndAttributes };

std::size_t plainLoop(const std::string& path, Each each) {
  const int folder = ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  require(folder >= 0, "the folder can be read");
  std::array<char, 32 << 10> buffer;
  std::array<char, 1024> names;
  std::size_t count = 0;
  std::string full = path + "/";
  const std::size_t prefix = full.size();
  while (true) {
    const long filled = ::syscall(SYS_getdents64, folder, buffer.data(), buffer.size());
    if (filled <= 0) break;
    for (long at = 0; at < filled;) {
      const auto* entry = reinterpret_cast<const LinuxEntry*>(buffer.data() + at);
      at += entry->length;
      if (entry->name[0] == '.') continue;
      ++count;
      if (each == Each::nothing) continue;
      struct statx status;
      require(::statx(folder, entry->name, AT_SYMLINK_NOFOLLOW, STATX_BASIC_STATS | STATX_BTIME,
                      &status) == 0,
              "each entry has a status");
      full.replace(prefix, std::string::npos, entry->name);
      require(::llistxattr(full.c_str(), names.data(), names.size()) >= 0,
              "each entry lists its attributes");
    }
  }
  ::close(folder);
  return count;
}

class Provider {
 public:
  explicit Provider(const BenchHome& home) {
    LinuxPlatform::Options options;
    options.home = home.path();
    platform_ = std::move(LinuxPlatform::open(std::move(options)).value());
    vessel_ = std::make_unique<LocalVessel>(platform_->platform(), roots_, owners_);
  }

  std::size_t walk(const std::string& folder, const FSDirectoryEnumerator::Visitor& visitor) {
    FSDirectoryEnumerator walker;
    walker.urls = {URL::fileURL(folder)};
    walker.limit = std::numeric_limits<std::uint64_t>::max();
    const Platform& platform = platform_->platform();
    return walker.enumerate(platform.directories, platform.resources, visitor).value();
  }

  /// Full items of everything in the folder, as a listing makes them.
  std::size_t list(const std::string& folder) {
    std::size_t items = 0;
    std::vector<URL> batch;
    const auto flush = [&] {
      const auto made = makeItems(vessel_->itemContext(), batch);
      require(made.has_value(), "entries are read");
      for (const auto& item : *made) {
        require(item != nullptr && item->docID().has_value(), "each entry is an item");
        ++items;
      }
      batch.clear();
    };
    walk(folder, [&](const URL& url) -> Result<void> {
      batch.push_back(url);
      if (batch.size() == batchSize) flush();
      return {};
    });
    flush();
    return items;
  }

 private:
  std::unique_ptr<LinuxPlatform> platform_;
  NoAppLibraryRoots roots_;
  NoAppLibraryOwners owners_;
  std::unique_ptr<LocalVessel> vessel_;
};

void benchFirstSight(const BenchHome& home, const std::string& folder, const Scale& scale) {
  Comparison comparison{firstSightRow, {}, {}, 3.0};
  if (!scale.includes(comparison.name)) return;
  for (int round = 0; round < scale.rounds; ++round) {
    home.forgetState();
    comparison.reference.push_back(secondsOf([&] { plainLoop(folder, Each::statAndAttributes); }));
    Provider provider(home);
    comparison.ours.push_back(
        secondsOf([&] { require(provider.list(folder) == scale.files, "all files are listed"); }));
  }
  print(comparison);
}

void benchKnown(Provider& provider, const std::string& folder, const Scale& scale) {
  Comparison comparison{knownRow, {}, {}, 1.5};
  if (!scale.includes(comparison.name)) return;
  for (int round = 0; round < scale.rounds; ++round) {
    comparison.reference.push_back(secondsOf([&] { plainLoop(folder, Each::statAndAttributes); }));
    comparison.ours.push_back(
        secondsOf([&] { require(provider.list(folder) == scale.files, "all files are listed"); }));
  }
  print(comparison);
}

void benchWalker(Provider& provider, const std::string& folder, const Scale& scale) {
  Comparison comparison{walkerRow, {}, {}, 1.3};
  if (!scale.includes(comparison.name)) return;
  const auto visit = [](const URL&) -> Result<void> { return {}; };
  for (int round = 0; round < scale.rounds; ++round) {
    comparison.reference.push_back(secondsOf([&] { plainLoop(folder, Each::nothing); }));
    comparison.ours.push_back(secondsOf(
        [&] { require(provider.walk(folder, visit) == scale.files, "all files are walked"); }));
  }
  print(comparison);
}

void benchMemory(Provider& provider, const BenchHome& home, const std::string& large) {
  const std::string small = home.makeFolder("small", 4 * batchSize);
  provider.list(small);
  const std::size_t before = residentKiB();
  provider.list(large);
  const std::size_t after = residentKiB();
  std::printf("%-54s %6zu KiB before, %zu KiB after\n", memoryRow, before, after);
  require(after < before + 16 * 1024, "memory does not grow with the folder");
}

}  // namespace

void runListingBenchmarks(const Scale& scale) {
  if (!scale.includesAny({firstSightRow, knownRow, walkerRow, memoryRow})) return;
  const BenchHome home;
  const std::string folder = home.makeFolder("large", scale.files);
  require(plainLoop(folder, Each::nothing) == scale.files, "the folder holds its files");
  printHeading("one folder of " + std::to_string(scale.files) + " files, median of " +
               std::to_string(scale.rounds) + " rounds");
  benchFirstSight(home, folder, scale);
  Provider provider(home);
  benchKnown(provider, folder, scale);
  benchWalker(provider, folder, scale);
  if (scale.includes(memoryRow)) benchMemory(provider, home, folder);
}

}  // namespace mirabel::bench
