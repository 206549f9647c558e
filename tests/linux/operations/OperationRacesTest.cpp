#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <random>
#include <set>
#include <stdio.h>
#include <thread>
#include <unistd.h>

#include "linux/operations/OperationsFixture.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

/// Other programs at work on the same tree.
class OperationRaces : public OperationsTest {
 protected:
  /// `change` happens just before the `number`th call of that name.
  void beforeCall(std::string_view name, int number, std::function<void()> change) {
    setCheck([=, this, count = 0](std::string_view call) mutable {
      if (call == name && ++count == number) change();
      return 0;
    });
  }
};

TEST_F(OperationRaces, ALinkThatIsPutInTheWayLeadsNoRemovalAndNoCopyOutOfTheTree) {
  const std::string precious = home.path() + "/precious", source = home.path() + "/source";
  const auto make = [](const std::string& folder, const char* contents) {
    fs::create_directories(folder + "/deep");
    std::ofstream(folder + "/file") << contents;
    std::ofstream(folder + "/deep/file") << contents;
  };
  // Before the `number`th folder is opened, a link has taken the place of the one called "sub".
  const auto lead = [&](const std::string& tree, int number) {
    beforeCall("open below", number, [=, this] {
      for (const auto& entry : fs::recursive_directory_iterator(tree)) {
        if (entry.path().filename() != "sub" || entry.is_symlink()) continue;
        fs::rename(entry.path(), home.path() + "/moved");
        fs::create_directory_symlink(precious, entry.path());
        break;
      }
    });
  };
  for (int number = 1; number < 12; ++number) {
    make(precious, "mine");
    make(home.at("folder/sub"), "x");
    lead(home.documents(), number);
    static_cast<void>(remove("folder"));
    setCheck({});
    close();
    EXPECT_TRUE(fs::exists(precious + "/file")) << number;
    EXPECT_TRUE(fs::exists(precious + "/deep/file")) << number;
    for (const std::string& left : {home.path() + "/moved", home.at("folder")})
      fs::remove_all(left);

    make(source + "/sub", "x");
    lead(source, number);
    static_cast<void>(import(source, ""));
    setCheck({});
    for (const auto& [name, contents] : tree())
      EXPECT_NE(contents, "mine") << name << ", " << number;
    for (const std::string& left : {home.path() + "/moved", source, home.at("source")})
      fs::remove_all(left);
  }
}

TEST_F(OperationRaces, ANameThatIsTakenMeanwhileIsNotReplaced) {
  const std::string source = home.path() + "/doc";
  std::ofstream(source) << "imported";
  const auto take = [this] { home.writeFile("doc", "theirs"); };
  beforeCall("rename", 1, take);
  EXPECT_EQ(vs_collidingURL(import(source, "").error()), home.url("doc"));
  setCheck({});
  EXPECT_EQ(tree(), (Tree{{"doc", "theirs"}}));
  EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
}

TEST_F(OperationRaces, AMoveAcrossFileSystemsIsUndoneWhenTheItemIsWrittenToMeanwhile) {
  makeFolder("folder");
  makeFolder("target");
  home.writeFile("folder/doc", "old");
  int renames = 0;
  setCheck([&](std::string_view call) {
    if (call != "rename") return 0;
    if (++renames == 1) return EXDEV;
    if (renames == 2) home.writeFile("folder/doc", "newer and longer");
    return 0;
  });
  EXPECT_EQ(failureOf(move("folder", "target")), EAGAIN);
  setCheck({});
  EXPECT_EQ(tree(), (Tree{{"folder", "/"}, {"folder/doc", "newer and longer"}, {"target", "/"}}));
  EXPECT_THAT(hiddenNames(), ::testing::IsEmpty());
}

TEST_F(OperationRaces, AFolderThatReplacesTheOneThatIsDeletedStays) {
  makeFolder("package");
  home.writeFile("package/old", "1");
  beforeCall("rename", 1, [this] {
    home.rename("package", "package~");
    makeFolder("package");
    home.writeFile("package/new", "2");
  });
  const auto error = remove("package");
  setCheck({});
  EXPECT_TRUE(error.value().isPosix(EAGAIN));
  EXPECT_EQ(tree().at("package/new"), "2");
  EXPECT_EQ(tree().at("package~/old"), "1");
}

TEST_F(OperationRaces, AFileThatShrinksWhileItIsCopiedIsCopiedAsItIsThen) {
  const std::string source = home.path() + "/doc";
  std::ofstream(source) << "long contents";
  setCheck([&, copies = 0](std::string_view call) mutable {
    // Behind its first copy.
    if (call == "status" && copies == 1) std::ofstream(source, std::ios::trunc) << (++copies, "");
    if (call == "copy contents") ++copies;
    return 0;
  });
  ASSERT_TRUE(import(source, ""));
  setCheck({});
  EXPECT_EQ(tree(), (Tree{{"doc", ""}}));
}

TEST_F(OperationRaces, AFileThatKeepsChangingIsNotImportedHalfOldHalfNew) {
  const std::string source = home.path() + "/log";
  std::ofstream(source) << "begin";
  setCheck([&](std::string_view call) {
    if (call == "copy contents") std::ofstream(source, std::ios::app) << "more";
    return 0;
  });
  // Written to once while it is copied, it is copied again; here it never stands still.
  EXPECT_EQ(failureOf(import(source, "")), EAGAIN);
  setCheck({});
  EXPECT_EQ(tree(), Tree());
}

// An editor saves, a mover moves and a trasher trashes the same documents at the same time. Each
// text that is written is different, and only the editor replaces any: it exchanges its new file
// with the document, so that it knows what it has replaced.
class ManyPrograms : public OperationsTest {
 protected:
  static constexpr int documents = 8;

  std::string documentAt(std::uint64_t number) const {
    return "folder" + std::to_string(number % 2) + "/doc" + std::to_string(number % documents);
  }

  void edit(std::mt19937_64 random, int editor) {
    for (int save = 0; save < saves_; ++save) {
      const std::string text = std::to_string(editor) + "." + std::to_string(save);
      const std::string name = home.at("save" + std::to_string(editor));
      std::ofstream(name) << text;
      written_[editor].insert(text);
      const std::string document = home.at(documentAt(random()));
      const auto renames = [&](unsigned flags) {
        return ::renameat2(AT_FDCWD, name.c_str(), AT_FDCWD, document.c_str(), flags) == 0;
      };
      if (renames(RENAME_EXCHANGE)) {
        std::ifstream(name) >> replaced_[editor].emplace_back();
      } else if (renames(RENAME_NOREPLACE)) {
        continue;
      } else {
        replaced_[editor].push_back(text);
      }
      ::unlink(name.c_str());
    }
  }

  // A minute's worth of them takes some 600,000.
  const char* const given_ = std::getenv("MIRABEL_TEST_SAVES");
  const int saves_ = given_ == nullptr ? 1000 : std::atoi(given_);
  std::atomic<bool> isOver_ = false;
  std::set<std::string> written_[2];
  std::vector<std::string> replaced_[2];
};

TEST_F(ManyPrograms, LoseNothingThatWasWritten) {
  const std::uint64_t seed = std::random_device()();
  SCOPED_TRACE("seed " + std::to_string(seed));
  makeFolder("folder0");
  makeFolder("folder1");
  static_cast<void>(opened());
  std::vector<std::thread> programs;
  for (const int editor : {0, 1})
    programs.emplace_back([&, editor] { edit(std::mt19937_64(seed + editor), editor); });
  programs.emplace_back([&] {
    for (std::mt19937_64 random(seed + 2); !isOver_;) {
      static_cast<void>(move(documentAt(random()), "folder" + std::to_string(random() % 2), {},
                             random() % 2 == 0 ? Bouncing::allowed : Bouncing::refused));
    }
  });
  programs.emplace_back([&] {
    for (std::mt19937_64 random(seed + 3); !isOver_;)
      static_cast<void>(trash(documentAt(random())));
  });
  for (std::thread& program : programs) {
    // The editors first; the others go on until those have ended.
    if (&program == &programs[2]) isOver_ = true;
    program.join();
  }

  std::multiset<std::string> expected;
  for (const auto& written : written_)
    expected.insert(written.begin(), written.end());
  for (const auto& replaced : replaced_) {
    for (const std::string& text : replaced)
      expected.erase(expected.find(text));
  }
  std::multiset<std::string> found;
  for (const auto& [path, contents] : tree()) {
    if (contents != "/") found.insert(contents);
  }
  EXPECT_EQ(found, expected);
  EXPECT_GT(tree(".Trash").size(), 2U);
}

}  // namespace
}  // namespace mirabel::testing
