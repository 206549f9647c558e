#include <fcntl.h>
#include <filesystem>
#include <fstream>

#include "linux/kernel/ObjectStatus.h"
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

  PendingCopy copyAt(std::string_view name) const {
    const std::string path = home.at(name);
    const auto status = statusOf(path).value();
    return {status.inode, handleAt(AT_FDCWD, path).value_or(""),
            static_cast<std::uint64_t>(status.birthTime)};
  }

  void setSameTime(std::string_view name, std::string_view other) const {
    fs::last_write_time(home.at(name), fs::last_write_time(home.at(other)));
  }

  void start(const PendingRecords& records) {
    const Data bytes = records.encode().value();
    std::ofstream(state_ + "/pending", std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), std::ssize(bytes));
    static_cast<void>(opened());
    close();
  }

  PendingRecords moveOf(PendingCopy copy) const {
    PendingRecords records;
    records.moves.push_back({from_, "doc", hidden, to_, "doc", std::move(copy)});
    records.removals = {{from_, prefix}, {to_, prefix}};
    return records;
  }

  PendingFolder from_;
  PendingFolder to_;
  std::string state_;
};

TEST_F(Recovery, OfAMoveWhoseCopyIsNotToBeFoundKeepsTheItem) {
  // Its name is taken by something new, and the folder that it was to go to is gone.
  home.writeFile("from/" + hidden, "item");
  home.writeFile("from/doc", "new");
  home.remove("to");
  start(moveOf({12345, "", 0}));
  EXPECT_EQ(tree(), (Tree{{"from", "/"}, {"from/doc", "new"}, {"from/doc 2", "item"}}));

  // Something else has the name that the copy was to have.
  home.rename("from/doc 2", "from/" + hidden);
  makeFolder("to");
  home.writeFile("to/doc", "somebody's");
  start(moveOf(copyAt("from/doc")));
  EXPECT_EQ(tree().at("from/doc 2"), "item");
  EXPECT_EQ(tree().at("to/doc"), "somebody's");
}

TEST_F(Recovery, OfAMoveKeepsBothUnlessTheCopyIsTheOneThatWasMadeAndStillLikeTheItem) {
  struct Change {
    const char* what;
    std::function<void(PendingCopy& copy)> make;
  };
  const Change changes[] = {
      {"its number was given to another file", [](PendingCopy& copy) { copy.birthTime -= 1; }},
      {"so it was, and times are not kept", [](PendingCopy& copy) { copy.handle += "x"; }},
      {"somebody wrote to it", [&](PendingCopy&) { home.writeFile("to/doc", "more"); }},
  };
  for (const Change& change : changes) {
    home.writeFile("from/" + hidden, "item");
    home.writeFile("to/doc", "item");
    setSameTime("to/doc", "from/" + hidden);
    PendingRecords records = moveOf(copyAt("to/doc"));
    change.make(records.moves.front().copy);
    start(records);
    EXPECT_TRUE(tree().contains("from/doc") && tree().contains("to/doc")) << change.what;
    EXPECT_FALSE(hasPendingWork()) << change.what;
    home.remove("from/doc");
    home.remove("to/doc");
  }
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
  // The latter is larger than any.
  for (const std::uintmax_t size : {40u, 17u << 20}) {
    std::ofstream(state_ + "/pending") << "MRBPEND2 and then something else";
    fs::resize_file(state_ + "/pending", size);
    static_cast<void>(opened());
    EXPECT_TRUE(fs::exists(home.at("from/" + hidden)));
    EXPECT_TRUE(fs::remove(state_ + "/pending.damaged"));
    makeFolder("to/folder");
    EXPECT_EQ(remove("to/folder"), std::nullopt);
    close();
  }
}

TEST_F(Recovery, RecordDoesNotGrowWithTheFoldersThatWereWorkedIn) {
  std::uintmax_t largest = 0;
  for (int i = 0; i < 150; ++i) {
    const std::string name = std::to_string(1000 + i);
    makeFolder(name + "/folder");
    ASSERT_EQ(remove(name + "/folder"), std::nullopt);
    const std::uintmax_t size = fs::file_size(state_ + "/pending");
    if (i == 50) largest = size + 100;
    ASSERT_TRUE(i < 50 || size <= largest) << i << ": " << size;
  }
  close();
  EXPECT_FALSE(hasPendingWork());
}

PendingRecords sample() {
  PendingRecords records;
  records.removals.push_back({{"/home/me/Documents/\xFF", 7}, ".mirabel-1-"});
  records.moves.push_back({{"/a", 1},
                           "doc",
                           ".mirabel-1-2",
                           {"/b", (1ULL << 62) + 3},
                           "doc 2",
                           {8, std::string("\1\0\xFF", 3), 9}});
  records.renames.push_back({{"/a", 1}, "readme", ".mirabel-kept-3", "README"});
  return records;
}

// What is half read could remove what it should not.
TEST(PendingRecords, AreNothingWhenAnyOfTheirBytesIsDamaged) {
  const Data whole = sample().encode().value();
  EXPECT_EQ(PendingRecords::decode(whole), sample());
  for (std::size_t length = 0; length < whole.size(); ++length) {
    const Data cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
    EXPECT_FALSE(PendingRecords::decode(cut)) << length;
  }
  for (std::size_t bit = 0; bit < whole.size() * 8; ++bit) {
    Data flipped = whole;
    flipped[bit / 8] ^= static_cast<std::uint8_t>(1U << (bit % 8));
    EXPECT_FALSE(PendingRecords::decode(flipped)) << bit;
  }
}

}  // namespace
}  // namespace mirabel::testing
