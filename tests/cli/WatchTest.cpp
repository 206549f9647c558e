#include <algorithm>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <functional>
#include <set>
#include <sys/wait.h>

#include "cli/CommandLineFixture.h"
#include "cli/InstalledApps.h"
#include "cli/Running.h"

namespace mirabel::testing {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

class Watch : public CommandLineFixture {
 protected:
  std::vector<std::string> command(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(), {MIRABEL_PROGRAM, "--home", home.path()});
    return arguments;
  }
  using Batch = nlohmann::json;
  /// Waits for a batch that has what is looked for; null when none comes.
  static Batch await(Running& watch, const std::function<bool(const Batch&)>& has) {
    for (std::string line = watch.output().line(); !line.empty(); line = watch.output().line()) {
      Batch batch = Batch::parse(line);
      if (has(batch)) return batch;
    }
    return {};
  }
  /// Waits until the item of that name is told, of that size.
  static Batch awaitItem(Running& watch, const std::string& name, std::size_t size) {
    Batch found;
    await(watch, [&](const Batch& batch) {
      for (const Batch& item : batch.at("updated"))
        if (item.at("filename") == name && item.at("documentSize") == std::to_string(size))
          found = item;
      return !found.is_null();
    });
    return found;
  }
  static void expectBegins(Running& watch) {
    EXPECT_THAT(watch.errors().line(), HasSubstr("watching"));
  }
  static void end(Running& watch, int signal = SIGTERM) {
    watch.send(signal);
    const int status = watch.end();
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
  }
  static void expectEndsWithItsFolder(Running& watch) {
    EXPECT_THAT(watch.errors().line(), HasSubstr("no item has this identifier"));
    EXPECT_EQ(WEXITSTATUS(watch.end()), 3);
  }
  /// The anchor in the line that people get.
  static std::string anchorIn(const std::string& line) {
    const std::string before = "mirabel: the anchor is now ";
    EXPECT_THAT(line, StartsWith(before));
    return line.size() < before.size()
               ? ""
               : line.substr(before.size(), line.size() - before.size() - 1);
  }
};

TEST_F(Watch, TellsEachChangeWhileItRunsAndKeepsIdentities) {
  home.makeFolder("folder");
  for (const char* container : {"workingset", "root"}) {
    Running watch(command({"--json", "watch", container}));
    const Batch first = Batch::parse(watch.output().line());
    EXPECT_EQ(first.at("updated").size(), 0u);
    EXPECT_FALSE(first.at("anchor").get<std::string>().empty());
    EXPECT_EQ(run({"--timeout", "0", "ls"}).code, 7) << "it holds the volume";

    home.writeFile("doc", "one");
    const Batch made = awaitItem(watch, "doc", 3);
    ASSERT_FALSE(made.is_null()) << container;
    home.writeFile(".doc.tmp", "another");
    home.rename(".doc.tmp", "doc");
    const Batch saved = awaitItem(watch, "doc", 7);
    ASSERT_FALSE(saved.is_null()) << container;
    EXPECT_EQ(saved.at("itemIdentifier"), made.at("itemIdentifier"));
    EXPECT_NE(saved.at("fileID"), made.at("fileID"));
    home.remove("doc");
    const Batch batch = await(watch, [](const Batch& b) { return !b.at("deleted").empty(); });
    EXPECT_EQ(batch.at("deleted"), Batch({made.at("itemIdentifier")}));
    end(watch);
    EXPECT_EQ(watch.errors().rest(), "");
  }
}

TEST_F(Watch, EndsWithTheAnchorToGoOnFrom) {
  for (const int signal : {SIGINT, SIGTERM}) {
    Running watch(command({"watch", "workingset"}));
    EXPECT_EQ(watch.errors().line(), "mirabel: watching workingset; Ctrl-C ends it\n");
    // Made by one system call, so that no part of it comes after the anchor.
    home.makeFolder("seen");
    EXPECT_THAT(watch.output().line(), HasSubstr(home.at("seen") + "\n"));
    end(watch, signal);
    const std::string anchor = anchorIn(watch.errors().rest());
    home.makeFolder("later");
    const Answer later = run({"changes", "--since", anchor, "workingset"});
    EXPECT_THAT(later.out, StartsWith("updated"));
    EXPECT_THAT(later.out, ::testing::EndsWith(home.at("later") + "\n"));
    EXPECT_EQ(std::ranges::count(later.out, '\n'), 1) << later.out;
    home.remove("seen");
    home.remove("later");
  }
}

TEST_F(Watch, FirstTellsWhatChangedSinceAnAnchor) {
  home.writeFile("old");
  const std::string before = anchor();
  for (int i = 0; i < 250; ++i)
    home.writeFile("new" + std::to_string(i));
  Running watch(command({"--json", "watch", "--since", before}));
  std::set<std::string> told;
  await(watch, [&](const Batch& batch) {
    for (const Batch& item : batch.at("updated"))
      told.insert(item.at("filename"));
    return batch.at("moreComing") == false;
  });
  EXPECT_EQ(told.size(), 250u);
  home.writeFile("live");
  EXPECT_FALSE(awaitItem(watch, "live", 0).is_null());
  end(watch);
  for (const char* bad : {"garbage", "AAAA", ""})
    expectFailure(run({"watch", "--since", bad}), 4, "start over");
}

TEST_F(Watch, FollowsAFolderByItsIdentityToItsEnd) {
  home.makeFolder("folder");
  Running watch(command({"watch", home.at("folder")}));
  expectBegins(watch);
  home.rename("folder", "renamed");
  home.makeFolder("renamed/first");
  EXPECT_THAT(watch.output().line(), HasSubstr(home.at("renamed/first")));
  home.makeFolder("renamed/second");
  EXPECT_THAT(watch.output().line(), HasSubstr(home.at("renamed/second")));
  home.remove("renamed");
  expectEndsWithItsFolder(watch);
}

// What the record of the name that it left says of it is not what it is by now.
TEST_F(Watch, TellsThatAFolderLeftWhichThenBecameAPackage) {
  for (const char* folder : {"watched", "watched/x", "other", "other/e.package"})
    home.makeFolder(folder);
  const std::string identifier = run({"id", home.at("watched/x")}).out;
  ASSERT_THAT(identifier, StartsWith("fid="));
  Running watch(command({"watch", home.at("watched")}));
  expectBegins(watch);
  home.rename("watched/x", "other/e.package/e.package");
  home.rename("other/e.package", "other/plain");
  home.makeFolder("watched/later");
  std::string told;
  for (std::string line = "told\n"; !line.empty() && !line.ends_with("/later\n"); told += line)
    line = watch.output().line();
  end(watch);
  EXPECT_THAT(told + watch.output().rest(), HasSubstr("deleted  " + identifier));
}

TEST_F(Watch, OfAnApplicationThatIsRemovedEnds) {
  const InstalledApps apps(home);
  apps.install("org.example.Draw", "Draw");
  Running watch(command({"watch", "#org.example.Draw"}));
  expectBegins(watch);
  std::filesystem::create_directory(apps.documents("org.example.Draw") + "/new");
  EXPECT_THAT(watch.output().line(), HasSubstr("/new\n"));
  apps.remove("org.example.Draw");
  expectEndsWithItsFolder(watch);
}

TEST_F(Watch, EndsQuietlyWhenItsReaderHasLeftThoughNothingChanges) {
  Running watch(command({"watch"}));
  expectBegins(watch);
  watch.output().leave();
  const int status = watch.end();
  EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGPIPE) << status;
  EXPECT_EQ(watch.errors().rest(), "");
}

TEST_F(Watch, NeedsAFolder) {
  home.writeFile("doc");
  for (const char* word : {"watch", "anchor"})
    expectFailure(run({word, home.at("doc")}), 1, "it is not a folder");
  expectFailure(run({"watch", home.at("missing")}), 3, "no such file or folder");
}

/// The user may have ten marks, and the documents are fifty folders.
class WatchWithFewMarks : public Watch {
 protected:
  void SetUp() override {
    if (std::system((limit + " 2>/dev/null'").c_str()) != 0) {
      GTEST_SKIP() << "may not have a namespace with limits of its own";
    }
    for (int i = 0; i < 50; ++i)
      home.makeFolder("folder" + std::to_string(i));
    home.writeFile("folder7/doc", "Dear Aunt");
  }
  std::vector<std::string> limited(std::vector<std::string> arguments) const {
    auto words = command(std::move(arguments));
    words.insert(words.begin(), {"unshare", "-Ur", "sh", "-c", script + " && exec \"$0\" \"$@\""});
    return words;
  }
  Answer runLimited(std::vector<std::string> arguments) const {
    Running program(limited(std::move(arguments)));
    Answer answer{0, program.output().rest(), program.errors().rest()};
    answer.code = WEXITSTATUS(program.end());
    return answer;
  }
  static void expectSaidOnce(const std::string& errors) {
    EXPECT_THAT(errors, StartsWith("mirabel: can't watch the folders for changes: that needs 51 "
                                   "marks, and 10 are allowed; raise \"user.max_"));
    EXPECT_EQ(errors.find("can't watch", 20), std::string::npos) << errors;
  }

  const std::string script =
      "echo 10 >/proc/sys/user/max_fanotify_marks && echo 10 >/proc/sys/user/max_inotify_watches";
  const std::string limit = "unshare -Ur sh -c '" + script;
};

TEST_F(WatchWithFewMarks, ChangesAreRightAndTheLimitIsToldOnce) {
  const Answer anchor = runLimited({"anchor", "workingset"});
  expectSaidOnce(anchor.err);
  const std::string document = run({"id", home.at("folder7/doc")}).out;
  home.writeFile("folder7/.tmp", "Dear Uncle");
  home.rename("folder7/.tmp", "folder7/doc");
  home.rename("folder8", "folder9/inner");
  home.writeFile("folder20/new");
  const std::string since = anchor.out.substr(0, anchor.out.size() - 1);
  const Answer limitedAnswer = runLimited({"changes", "--since", since, "workingset"});
  EXPECT_EQ(limitedAnswer.code, 0);
  expectSaidOnce(limitedAnswer.err);
  for (const char* path :
       {"folder7", "folder7/doc", "folder9", "folder9/inner", "folder20", "folder20/new"}) {
    EXPECT_THAT(limitedAnswer.out, HasSubstr("  " + home.at(path) + "\n"));
  }
  EXPECT_THAT(limitedAnswer.out, HasSubstr(document.substr(0, document.size() - 1) + "  "));
  EXPECT_EQ(std::ranges::count(limitedAnswer.out, '\n'), 6) << limitedAnswer.out;
  EXPECT_EQ(run({"changes", "--since", since, "workingset"}).out, limitedAnswer.out);

  const Answer status = runLimited({"status"});
  expectSaidOnce(status.err);
  EXPECT_THAT(status.out,
              HasSubstr("watching            no: it needs more marks than are allowed"));
  EXPECT_THAT(status.out, HasSubstr("51 needed, 10 allowed by \"user.max_"));
  const Batch object = runLimited({"--json", "status"}).json();
  EXPECT_FALSE(object.contains("watcher"));
  EXPECT_THAT(object.at("refusal").get<std::string>(), HasSubstr("raise \"user.max_"));
  EXPECT_THAT(runLimited({"doctor"}).out,
              HasSubstr("limited  watching: 51 folders are there; 10 folders at most, by \"user."));
}

TEST_F(WatchWithFewMarks, ChangesAreToldAsTheyCome) {
  Running watch(limited({"watch", "workingset"}));
  expectSaidOnce(watch.errors().line());
  expectBegins(watch);
  home.writeFile("folder7/doc", "Dear Uncle");
  EXPECT_THAT(watch.output().line(), HasSubstr(home.at("folder7/doc")));
  end(watch);
  EXPECT_FALSE(anchorIn(watch.errors().rest()).empty());
}

}  // namespace
}  // namespace mirabel::testing
