#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <regex>
#include <set>
#include <sstream>
#include <sys/wait.h>
#include <unistd.h>

#include "linux/operations/OperationsFixture.h"
#include "linux/operations/PendingRecords.h"

namespace mirabel::testing {
namespace {

namespace fs = std::filesystem;

/// Each operation with each of its system calls failing, and with the process killed before each of
/// them: whatever happens, the items are as they were or as they should be.
class InterruptedOperations : public OperationsTest,
                              public ::testing::WithParamInterface<std::string> {
 protected:
  void SetUp() override {
    makeTree();
    before_ = tree();
    // Always in another process: what is forked has none of the threads of this one.
    EXPECT_EQ(inProcess([this] { return run() ? 1 : 0; }), 0);
    after_ = tree();
    ASSERT_NE(before_, after_);
  }

  /// What it exits with; -1 when it is killed.
  int inProcess(const std::function<int()>& work) {
    const pid_t child = ::fork();
    if (child == 0) {
      const int code = work();
      close();
      ::_exit(code);
    }
    int status = 0;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

  void makeTree() {
    if (home_) clear();
    home_ = true;
    fs::create_directories(home.path() + "/outside/tree/sub");
    for (const char* file : {"file", "tree/one", "tree/sub/two"})
      home.writeFile("../outside/" + std::string(file), file);
    for (const char* folder : {"folder/sub/deep", "target", ".Trash"})
      makeFolder(folder);
    for (const char* file : {"folder/a", "folder/sub/b", "folder/sub/deep/c", "doc"})
      home.writeFile(file, file);
    home.makeSymlink("folder/link", "a");
  }

  void clear() {
    fs::remove_all(home.path() + "/outside");
    fs::remove_all(home.documents());
    fs::create_directory(home.documents());
  }

  /// The error, if there was one.
  std::optional<Error> run() {
    const std::string_view name = GetParam();
    const auto errorOf = [](const Result<URL>& result) {
      return result ? std::nullopt : std::optional(result.error());
    };
    if (name == "ImportFile") return errorOf(import(home.path() + "/outside/file", ""));
    if (name == "ImportTree") return errorOf(import(home.path() + "/outside/tree", "target"));
    if (name == "CreateFolder") return errorOf(createFolder("folder", "new"));
    if (name == "Rename") return errorOf(rename("folder", "renamed"));
    if (name == "DeleteFile") return remove("doc");
    if (name == "DeleteTree") return remove("folder");
    if (name == "Trash") return errorOf(trash("folder"));
    if (name == "MoveFileAcross") return errorOf(move("doc", "target"));
    return errorOf(move("folder", "target", "moved"));
  }

  /// Runs it with something happening at the `number`th call; whether it came that far.
  bool interrupt(int number, const std::function<int()>& happening) {
    int calls = 0;
    // The first rename finds that it leads to another file system.
    bool hasCrossed = !GetParam().ends_with("Across");
    setCheck([=, this, &calls](std::string_view call) mutable {
      if (call == "rename" && !hasCrossed) {
        hasCrossed = true;
        return EXDEV;
      }
      return ++calls == number ? happening() : 0;
    });
    error_ = run();
    setCheck({});
    return calls >= number;
  }

  /// A start whose `number`th call fails; whether it came that far.
  bool recoverWithFailure(int number) {
    int calls = 0;
    setCheck([=, &calls](std::string_view) { return ++calls == number ? EIO : 0; });
    static_cast<void>(opened());
    close();
    setCheck({});
    return calls >= number;
  }

  /// Runs it in a process that is killed before the `number`th call; 0 where it did not come so
  /// far.
  int kill(int number) {
    makeTree();
    close();
    return inProcess(
        [=, this] { return interrupt(number, [] { return ::raise(SIGKILL); }) ? 1 : 0; });
  }

  /// Which names there are; the hidden ones without what differs from run to run.
  std::string state() const {
    std::set<std::string> names;
    for (const auto& entry : fs::recursive_directory_iterator(home.documents()))
      names.insert(std::regex_replace(entry.path().native(), std::regex("mirabel-[^-]*-"), "-"));
    return ::testing::PrintToString(names);
  }

  bool hasPendingMove() const {
    for (const auto& entry : fs::recursive_directory_iterator(home.stateFolder())) {
      if (entry.path().filename() != "pending") continue;
      std::ostringstream file;
      file << std::ifstream(entry.path(), std::ios::binary).rdbuf();
      return !PendingRecords::decode(dataFromString(file.str())).value().moves.empty();
    }
    return false;
  }

  void expectWhole(int number) {
    const Tree now = tree();
    EXPECT_TRUE(now == before_ || now == after_)
        << "call " << number << ": " << ::testing::PrintToString(now);
  }

  void expectNothingLeft(int number) {
    static_cast<void>(opened());
    expectWhole(number);
    EXPECT_THAT(hiddenNames(), ::testing::IsEmpty()) << "call " << number;
    close();
    EXPECT_FALSE(hasPendingWork()) << "call " << number;
  }

  bool home_ = false;
  Tree before_;
  Tree after_;
  std::optional<Error> error_;
};

TEST_P(InterruptedOperations, LeaveItemsWholeWhicheverSystemCallFails) {
  for (int number = 1;; ++number) {
    makeTree();
    if (!interrupt(number, [=] { return number % 2 == 0 ? EIO : ENOSPC; })) break;
    // What is said to be done is done.
    if (!error_) {
      EXPECT_EQ(tree(), after_) << "call " << number;
    }
    expectWhole(number);
    close();
    expectNothingLeft(number);
    ASSERT_LT(number, 1000);
  }
}

TEST_P(InterruptedOperations, LeaveItemsWholeWhereverTheProcessIsKilled) {
  for (int number = 1;; ++number) {
    const int code = kill(number);
    if (code == 0) break;
    ASSERT_EQ(code, -1);
    expectNothingLeft(number);
    ASSERT_LT(number, 1000);
  }
}

/// What a start can't tell is not guessed, and done by the next one. Each state that a killed move
/// can leave is tried, for there something is hidden that is nowhere else.
using InterruptedMoves = InterruptedOperations;
TEST_P(InterruptedMoves, LeaveItemsWholeWhicheverCallOfTheNextStartFails) {
  std::set<std::string> tried;
  for (int number = 1; kill(number) != 0; ++number) {
    if (!hasPendingMove() || !tried.insert(state()).second) continue;
    for (int failing = 1; recoverWithFailure(failing); ++failing) {
      SCOPED_TRACE("recovery's call " + std::to_string(failing));
      expectNothingLeft(number);
      kill(number);
    }
  }
  EXPECT_EQ(tried.size(), 3);
}

INSTANTIATE_TEST_SUITE_P(Each, InterruptedOperations,
                         ::testing::Values("ImportFile", "ImportTree", "CreateFolder", "Rename",
                                           "DeleteFile", "DeleteTree", "Trash", "MoveFileAcross",
                                           "MoveTreeAcross"));
INSTANTIATE_TEST_SUITE_P(Each, InterruptedMoves, ::testing::Values("MoveFileAcross"));

}  // namespace
}  // namespace mirabel::testing
