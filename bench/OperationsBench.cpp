// What operations on whole folders cost beside the tools that everybody has: a folder of 10,000
// small files imported, beside `cp -a` of the same and one fsync for each file, since an import is
// on disk when it is done; and a tree of 100,000 files deleted, beside `rm -rf` of one like it. In
// memory, nothing that is synchronised costs anything; on a file system with a journal, which
// $MIRABEL_BENCH_DIR may lie on, that is most of it.
#include <algorithm>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <future>
#include <memory>
#include <unistd.h>

#include "BenchHome.h"
#include "BenchTree.h"
#include "linux/files/LinuxPlatform.h"

namespace mirabel::bench {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t smallFile = 2048;

void shell(const std::string& command) {
  require(std::system(command.c_str()) == 0, "the tool succeeds");
}

void syncEach(const std::string& folder) {
  for (const auto& entry : fs::directory_iterator(folder)) {
    const int file = ::open(entry.path().c_str(), O_RDONLY | O_CLOEXEC);
    require(file >= 0 && ::fsync(file) == 0, "a copied file is synchronised");
    ::close(file);
  }
}

std::unique_ptr<LinuxPlatform> openPlatform(const BenchHome& home) {
  LinuxPlatform::Options options;
  options.home = home.path();
  return LinuxPlatform::open(std::move(options)).value();
}

void benchImport(const Scale& scale) {
  Comparison row{"import of a folder of small files / cp -a and an fsync each", {}, {}, 1.5};
  if (!scale.includes(row.name)) return;
  const BenchHome home(BenchHome::Where::memory);
  const std::size_t files = scale.files / 10;
  const std::string source = home.path() + "/source";
  fs::create_directory(source);
  for (std::size_t i = 0; i < files; ++i)
    std::ofstream(source + "/file" + std::to_string(i)) << std::string(smallFile, 'x');
  const std::string copy = home.documents() + "/copy";
  const std::string imported = home.documents() + "/source";
  for (int round = 0; round < scale.rounds; ++round) {
    ::sync();
    row.reference.push_back(secondsOf([&] {
      shell("cp -a '" + source + "' '" + copy + "'");
      syncEach(copy);
    }));
    fs::remove_all(copy);
    const auto platform = openPlatform(home);
    ::sync();
    row.ours.push_back(secondsOf([&] {
      std::promise<Result<URL>> done;
      platform->platform().operations.vs_importUnderFolder(
          URL::fileURL(source), URL::fileURL(home.documents()),
          [&](Result<URL> url) { done.set_value(std::move(url)); });
      require(done.get_future().get().has_value(), "the folder is imported");
    }));
    const auto count = std::distance(fs::directory_iterator(imported), fs::directory_iterator());
    require(static_cast<std::size_t>(count) == files, "all files are imported");
    fs::remove_all(imported);
  }
  print(row);
}

void benchDelete(const Scale& scale) {
  Comparison row{"delete of a tree / rm -rf", {}, {}, 1.2};
  if (!scale.includes(row.name)) return;
  const BenchHome home(BenchHome::Where::memory);
  const std::string folder = home.documents() + "/tree";
  const BenchTree tree(folder, std::max<std::size_t>(1, scale.files / 20), scale.files);
  const auto make = [&] {
    fs::create_directory(folder);
    tree.make();
    ::sync();
  };
  for (int round = 0; round < scale.rounds; ++round) {
    make();
    row.reference.push_back(secondsOf([&] { shell("rm -rf '" + folder + "'"); }));
    make();
    const auto platform = openPlatform(home);
    row.ours.push_back(secondsOf([&] {
      std::promise<std::optional<Error>> done;
      platform->platform().operations.vs_deleteWithCompletionHandler(
          URL::fileURL(folder), [&](std::optional<Error> error) { done.set_value(error); });
      require(!done.get_future().get(), "the tree is deleted");
    }));
    require(!fs::exists(folder), "nothing of it is left");
  }
  print(row);
}

}  // namespace

void runOperationBenchmarks(const Scale& scale) {
  if (!scale.includesAny({"import of a folder of small files / cp -a and an fsync each",
                          "delete of a tree / rm -rf"})) {
    return;
  }
  printHeading("Operations on whole folders");
  benchImport(scale);
  benchDelete(scale);
}

}  // namespace mirabel::bench
