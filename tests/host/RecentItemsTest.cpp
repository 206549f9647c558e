#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <gmock/gmock.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <thread>
#include <unistd.h>

#include "host/ItemRecords.h"
#include "host/LocalDocuments.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

/// Exchanges two names.
void exchange(const std::string& a, const std::string& b) {
  ASSERT_EQ(::renameat2(AT_FDCWD, a.c_str(), AT_FDCWD, b.c_str(), RENAME_EXCHANGE), 0);
}

void writeThroughMap(const std::string& path) {
  const int file = ::open(path.c_str(), O_RDWR | O_CLOEXEC);
  void* map = ::mmap(nullptr, 4, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  ASSERT_NE(map, MAP_FAILED);
  *static_cast<char*>(map) = '!';
  ::munmap(map, 4);
  ::close(file);
}

class RecentItemsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    home.makeFolder("folder");
    home.makeFolder("folder/notes.quill");
    home.makeFolder("folder/inner");
    home.makeFolder("other");
    home.makeFolder("other/inner");
    home.writeFile("folder/inner/letter.txt", "text");
    home.writeFile("folder/inner/second.txt", "more");
    documents = LocalDocuments::open({.home = home.path()}).value();
    identifier = documents->itemAtPath(letter)->itemIdentifier;
  }
  /// Asks until the item is remembered, which it is once its last change is a while ago.
  [[nodiscard]] bool becomesKnown() {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (!documents->itemAtOnce(identifier)) {
      if (!documents->item(identifier) || std::chrono::steady_clock::now() > deadline) return false;
      std::this_thread::yield();
    }
    return true;
  }
  [[nodiscard]] std::optional<ItemRecord> lookedUp() {
    const auto item = documents->lookup().byIdentifier(identifier);
    return item ? std::optional(recordOf(**item)) : std::nullopt;
  }

  TempHome home;
  std::string letter = home.at("folder/inner/letter.txt");
  std::unique_ptr<LocalDocuments> documents;
  std::string identifier;
};

// What is remembered is right or is not told, whatever happened to the file or to its place.
TEST_F(RecentItemsTest, NoChangeIsMissed) {
  const std::string folder = home.at("folder");
  const std::string other = home.at("other");
  const struct {
    const char* what;
    std::function<void()> happen;
  } changes[] = {
      {"written", [&] { std::ofstream(letter, std::ios::app) << "more"; }},
      {"written through a map", [&] { writeThroughMap(letter); }},
      {"mode", [&] { ASSERT_EQ(::chmod(letter.c_str(), 0444), 0); }},
      {"mode back", [&] { ASSERT_EQ(::chmod(letter.c_str(), 0644), 0); }},
      {"time set", [&] { fs::last_write_time(letter, fs::file_time_type::clock::now()); }},
      {"linked elsewhere", [&] { fs::create_hard_link(letter, other + "/inner/letter.txt"); }},
      {"its folder exchanged for one that has it too",
       [&] { exchange(folder + "/inner", other + "/inner"); }},
      {"exchanged again, further up", [&] { exchange(folder, other); }},
      {"its folder moved away and linked to",
       [&] {
         fs::rename(folder, home.at("moved"));
         fs::create_directory_symlink(home.at("moved"), folder);
       }},
      {"back",
       [&] {
         fs::remove(folder);
         fs::rename(home.at("moved"), folder);
       }},
      {"replaced",
       [&] {
         home.writeFile("folder/inner/.new", "new text");
         home.rename("folder/inner/.new", "folder/inner/letter.txt");
       }},
      {"exchanged for another", [&] { exchange(letter, folder + "/inner/second.txt"); }},
      {"trashed",
       [&] {
         std::promise<bool> isTrashed;
         documents->trash(identifier,
                          [&](const auto& item) { isTrashed.set_value(item.has_value()); });
         ASSERT_TRUE(isTrashed.get_future().get());
       }},
  };
  for (const auto& change : changes) {
    SCOPED_TRACE(change.what);
    ASSERT_TRUE(becomesKnown());
    change.happen();
    const auto told = documents->itemAtOnce(identifier);
    const auto now = lookedUp();
    if (told) {
      EXPECT_TRUE(now && *told == *now);
    }
    const auto asked = documents->item(identifier);
    ASSERT_EQ(asked.has_value(), now.has_value());
    if (now) {
      EXPECT_TRUE(*asked == *now);
    }
  }
}

// What lies on another mount is not entered, though it be the same folder.
TEST_F(RecentItemsTest, AMountOverAFolderFurtherUpHidesTheItem) {
  ASSERT_TRUE(becomesKnown());
  const std::string folder = home.at("folder");
  if (::mount(folder.c_str(), folder.c_str(), nullptr, MS_BIND, nullptr) != 0) {
    GTEST_SKIP() << "only who may mount sees this";
  }
  const bool isTold = documents->itemAtOnce(identifier) != nullptr;
  const bool isFound = documents->item(identifier).has_value();
  ASSERT_EQ(::umount2(folder.c_str(), MNT_DETACH), 0);
  EXPECT_FALSE(isTold);
  EXPECT_FALSE(isFound);
  EXPECT_TRUE(becomesKnown());
}

TEST_F(RecentItemsTest, AttributesAreSeen) {
  if (!hasUserAttributes(home.path())) GTEST_SKIP() << "no user attributes here";
  ASSERT_TRUE(becomesKnown());
  std::optional<ItemRecord> tagged;
  documents->setFavoriteRank(identifier, Number::of(std::int64_t{7}),
                             [&](const auto& item) { tagged = item.value(); });
  const auto told = documents->itemAtOnce(identifier);
  EXPECT_TRUE(!told || *told == *tagged);
  ASSERT_TRUE(becomesKnown());
  EXPECT_TRUE(documents->itemAtOnce(identifier)->favoriteRank.has_value());
}

TEST_F(RecentItemsTest, AFolderIsRememberedAndAPackageIsNot) {
  const auto package = documents->itemAtPath(home.at("folder/notes.quill"))->itemIdentifier;
  identifier = documents->itemAtPath(home.at("folder/inner"))->itemIdentifier;
  ASSERT_TRUE(becomesKnown());
  home.writeFile("folder/inner/third.txt");
  const auto told = documents->itemAtOnce(identifier);
  EXPECT_TRUE(!told || told->childItemCount == 3);
  EXPECT_EQ(documents->item(identifier)->childItemCount, 3);
  // It is older than the folder, and so has been settled for as long.
  for (int i = 0; i < 3; ++i)
    ASSERT_TRUE(documents->item(package));
  EXPECT_FALSE(documents->itemAtOnce(package));
}

}  // namespace
}  // namespace mirabel::testing
