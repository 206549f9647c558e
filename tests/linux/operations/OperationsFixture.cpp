#include "linux/operations/OperationsFixture.h"

#include <filesystem>
#include <fstream>
#include <sstream>

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

bool isHidden(const fs::path& path) {
  return path.filename().native().starts_with(".mirabel-");
}

std::string describe(const fs::directory_entry& entry) {
  if (entry.is_symlink()) return "-> " + fs::read_symlink(entry).native();
  if (entry.is_directory()) return "/";
  if (!entry.is_regular_file()) return "special";
  std::ostringstream contents;
  contents << std::ifstream(entry.path(), std::ios::binary).rdbuf();
  return contents.str();
}

}  // namespace

LinuxPlatform& OperationsTest::opened() {
  if (!platform_) {
    LinuxPlatform::Options options;
    options.home = home.path();
    options.checkFileCall = [this](std::string_view call) { return check_ ? check_(call) : 0; };
    platform_ = LinuxPlatform::open(std::move(options)).value();
    std::vector<FollowedLibrary> libraries;
    for (const std::string& root : furtherRoots_)
      libraries.push_back({URL::fileURL(root), ""});
    EXPECT_TRUE(platform_->events().followLibraries(libraries, 1));
  }
  return *platform_;
}

Result<URL> OperationsTest::wait(const std::function<void(FileOperations::URLHandler)>& operation) {
  auto answer = std::make_shared<std::promise<Result<URL>>>();
  auto future = answer->get_future();
  // A second report would throw.
  operation([answer](Result<URL> url) { answer->set_value(std::move(url)); });
  return future.get();
}

Result<URL> OperationsTest::import(const std::string& source, std::string_view folder) {
  return wait([&](auto done) {
    operations().vs_importUnderFolder(URL::fileURL(source), home.url(folder), done);
  });
}

Result<URL> OperationsTest::createFolder(std::string_view folder, std::string_view name) {
  return wait([&](auto done) { operations().vs_createSubFolder(home.url(folder), name, done); });
}

Result<URL> OperationsTest::rename(std::string_view item, std::string_view name) {
  return wait([&](auto done) { operations().vs_renameWithNewName(home.url(item), name, done); });
}

Result<URL> OperationsTest::move(std::string_view item, std::string_view folder,
                                 std::optional<std::string> name, Bouncing bouncing) {
  return moveURL(home.url(item), home.url(folder), std::move(name), bouncing);
}

Result<URL> OperationsTest::moveURL(const URL& item, const URL& folder,
                                    std::optional<std::string> name, Bouncing bouncing) {
  return wait(
      [&](auto done) { operations().vs_reparentUnderFolder(item, folder, name, bouncing, done); });
}

Result<URL> OperationsTest::trash(std::string_view item) {
  if (auto made = operations().createDirectory(home.url(".Trash")); !made)
    return fail(made.error());
  return wait([&](auto done) {
    operations().vs_trashUnderFolder(home.url(item), home.url(".Trash"), done);
  });
}

std::optional<Error> OperationsTest::remove(std::string_view item) {
  auto answer = std::make_shared<std::promise<std::optional<Error>>>();
  operations().vs_deleteWithCompletionHandler(home.url(item), [answer](std::optional<Error> error) {
    answer->set_value(std::move(error));
  });
  return answer->get_future().get();
}

void OperationsTest::makeFolder(std::string_view folder) const {
  fs::create_directories(home.at(folder));
}

Tree OperationsTest::tree(std::string_view folder) const {
  Tree tree;
  const fs::path top = home.at(folder);
  for (auto entry = fs::recursive_directory_iterator(top);
       entry != fs::recursive_directory_iterator(); ++entry) {
    if (isHidden(entry->path())) {
      entry.disable_recursion_pending();
      continue;
    }
    tree.emplace(entry->path().lexically_relative(top), describe(*entry));
  }
  return tree;
}

std::vector<std::string> OperationsTest::hiddenNames() const {
  std::vector<std::string> names;
  for (const auto& entry : fs::recursive_directory_iterator(home.documents())) {
    if (isHidden(entry.path())) names.push_back(entry.path().native());
  }
  return names;
}

bool OperationsTest::hasPendingWork() const {
  if (!fs::exists(home.stateFolder())) return false;
  for (const auto& entry : fs::recursive_directory_iterator(home.stateFolder())) {
    if (entry.path().filename() == "pending") return true;
  }
  return false;
}

}  // namespace mirabel::testing
