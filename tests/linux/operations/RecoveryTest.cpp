#include <filesystem>
#include <fstream>
#include <sys/stat.h>

#include "linux/operations/OperationsFixture.h"
#include "linux/operations/PendingRecords.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

constexpr const char* prefix = ".mirabel-0123456789ABCDEF-";
const std::string hidden = std::string(prefix) + "1";

/// What a start makes of the record that a process left when it was killed.
class Recovery : public OperationsTest {
 protected:
  void SetUp() override {
    makeFolder("from");
    makeFolder("to");
    from_ = folder("from");
    to_ = folder("to");
    state_ = opened().index().stateFolder().path();
    close();
  }

  PendingFolder folder(std::string_view name) {
    const auto values = opened().platform().resources.readValues(home.url(name));
    return {home.at(name), values.value().fileID};
  }

  std::uint64_t inodeOf(std::string_view name) const {
    struct stat status {};
    EXPECT_EQ(::stat(home.at(name).c_str(), &status), 0);
    return status.st_ino;
  }

  void start(const PendingRecords& records) {
    const Data bytes = records.encode().value();
    std::ofstream(state_ + "/pending", std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), std::ssize(bytes));
    static_cast<void>(opened());
    close();
  }

  PendingRecords moveOf(std::uint64_t copyInode) const {
    PendingRecords records;
    records.moves.push_back({from_, "doc", hidden, to_, "doc", copyInode});
    records.removals = {{from_, prefix}, {to_, prefix}};
    return records;
  }

  PendingFolder from_;
  PendingFolder to_;
  std::string state_;
};

TEST_F(Recovery, OfAMoveGivesTheItemItsNameBackUnlessItsCopyHasOne) {
  home.writeFile("from/" + hidden, "item");
  home.writeFile("to/" + std::string(prefix) + "2", "copy");
  start(moveOf(inodeOf("to/" + std::string(prefix) + "2")));
  EXPECT_EQ(tree(), (Tree{{"from", "/"}, {"from/doc", "item"}, {"to", "/"}}));

  home.rename("from/doc", "from/" + hidden);
  home.writeFile("to/doc", "item");
  start(moveOf(inodeOf("to/doc")));
  EXPECT_EQ(tree(), (Tree{{"from", "/"}, {"to", "/"}, {"to/doc", "item"}}));
  EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
  EXPECT_FALSE(hasPendingWork());
}

TEST_F(Recovery, OfAMoveWhoseCopyIsNotToBeFoundKeepsTheItem) {
  // Its name is taken by something new, and the folder that it was to go to is gone.
  home.writeFile("from/" + hidden, "item");
  home.writeFile("from/doc", "new");
  home.remove("to");
  start(moveOf(12345));
  EXPECT_EQ(tree(), (Tree{{"from", "/"}, {"from/doc", "new"}, {"from/doc 2", "item"}}));

  // Something else has the name that the copy was to have.
  home.rename("from/doc 2", "from/" + hidden);
  makeFolder("to");
  home.writeFile("to/doc", "somebody's");
  start(moveOf(inodeOf("to/doc") + 1));
  EXPECT_EQ(tree().at("from/doc 2"), "item");
  EXPECT_EQ(tree().at("to/doc"), "somebody's");
}

TEST_F(Recovery, FindsItsFoldersWhereTheyAreNow) {
  PendingRecords records;
  records.removals = {{from_, prefix}};
  records.renames.push_back({to_, "readme", ".mirabel-kept-1", "README"});
  makeFolder("from/" + hidden + "/deep");
  home.writeFile("from/" + hidden + "/deep/file", "x");
  home.writeFile("from/.mirabel-of somebody else", "stays");
  home.writeFile("to/.mirabel-kept-1", "r");
  home.rename("from", "moved");
  home.rename("to", "moved/too");
  start(records);
  EXPECT_EQ(tree(), (Tree{{"moved", "/"}, {"moved/too", "/"}, {"moved/too/README", "r"}}));
  EXPECT_TRUE(fs::exists(home.at("moved/.mirabel-of somebody else")));
  EXPECT_FALSE(hasPendingWork());
}

TEST_F(Recovery, OfARenameTakesAFreeNameWhenBothAreTaken) {
  PendingRecords records;
  records.renames.push_back({to_, "readme", ".mirabel-kept-1", "README"});
  home.writeFile("to/.mirabel-kept-1", "r");
  home.writeFile("to/README", "1");
  home.writeFile("to/readme", "2");
  start(records);
  EXPECT_EQ(tree("to"), (Tree{{"README", "1"}, {"readme", "2"}, {"readme 2", "r"}}));
}

TEST_F(Recovery, WaitsForARootThatIsNotThere) {
  PendingRecords records;
  records.removals = {{from_, prefix}};
  home.writeFile("from/" + hidden, "x");
  const std::string aside = home.path() + "/aside";
  fs::rename(home.documents(), aside);
  start(records);
  EXPECT_TRUE(hasPendingWork());
  fs::rename(aside, home.documents());
  static_cast<void>(opened());
  close();
  EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
  EXPECT_FALSE(hasPendingWork());
}

TEST_F(Recovery, RemovesNothingOnTheWordOfADamagedRecord) {
  home.writeFile("from/" + hidden, "x");
  std::ofstream(state_ + "/pending") << "MRBPEND1 and then something else";
  static_cast<void>(opened());
  EXPECT_TRUE(fs::exists(home.at("from/" + hidden)));
  EXPECT_TRUE(fs::exists(state_ + "/pending.damaged"));
  EXPECT_TRUE(createFolder("to", "new"));
}

}  // namespace
}  // namespace mirabel::testing
