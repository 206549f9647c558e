#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <map>
#include <optional>
#include <random>
#include <set>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

/// What a client keeps of each thing: its parent and name, the time of its last change and its
/// size. Not its path: that changes with every folder above it. Nor any name of one that has
/// several: which of them it is held under is for the listing to choose.
using Replicas = std::map<std::string, std::string>;

class ReconcilerTest : public VolumeFixture {
 protected:
  static std::string identity(const Sighting& sighting) {
    return sighting.documentID != 0 ? "did=" + std::to_string(sighting.documentID)
                                    : "fid=" + std::to_string(sighting.fileID);
  }

  void hold(Replicas& replicas, const std::string& relative) {
    const Sighting seen = see(relative);
    const fs::path place(relative);
    std::string replica =
        std::to_string(seen.status.changeTime) + " " + std::to_string(seen.status.size) + " bytes";
    if (seen.status.linkCount == 1) {
      // What lies in a package is shown to nobody: that the package has taken over the document of
      // the one in whose place it was moved is told of itself alone.
      const std::string parent = place.parent_path();
      const bool isShown = !parent.empty() && !parent.ends_with(".package");
      replica += " " + (isShown ? identity(see(parent)) : "") + "/" + place.filename().native();
    }
    replicas.insert_or_assign(identity(seen), replica);
  }

  /// What a fresh look at everything shows.
  Replicas everything() {
    Replicas all;
    for (const auto& entry : fs::recursive_directory_iterator(documents_))
      hold(all, entry.path().native().substr(documents_.size() + 1));
    return all;
  }

  /// Applies the events after `since` as a client would: looks where they say.
  void catchUp(Replicas& replicas, std::uint64_t since) {
    index();
    ASSERT_TRUE(index().currentEventID());
    auto records = index().events(since, 1'000'000);
    ASSERT_TRUE(records) << records.error().description();
    for (const JournalRecord& record : *records) {
      ASSERT_EQ(record.id, ++since) << "events have consecutive IDs";
      if (record.isDocument) {
        const auto holder = index().fileIDOfDocument(record.documentID);
        if (!holder) replicas.erase("did=" + std::to_string(record.documentID));
        continue;
      }
      replicas.erase("fid=" + std::to_string(record.fileID));
      if (record.documentID != 0) replicas.erase("did=" + std::to_string(record.documentID));
      auto path = index().pathOfFileID(record.fileID);
      if (!path || *path == documents_) continue;
      hold(replicas, path->substr(documents_.size() + 1));
    }
  }
};

TEST_F(ReconcilerTest, AnUnchangedTreeMakesNoEvents) {
  run("mkdir a/b/c; write a/b/f");
  const std::uint64_t first = anchor();
  close();
  EXPECT_EQ(anchor(), first);
  EXPECT_TRUE(index().events(first + 1, 10).error().isPosix(ESTALE)) << "never given out";
}

// A container that showed a file under a name, or will, learns of it only from a record of a place
// in it: so each name that came or went, or whose turn may have come, is named.
class HardLinksTest : public ReconcilerTest,
                      public ::testing::WithParamInterface<std::optional<WatcherKind>> {
 protected:
  void SetUp() override {
    if (!GetParam()) return;
    makeWatcher_ = [] { return makeWatcher(*GetParam()); };
  }
};

TEST_P(HardLinksTest, NamesAreToldThatCameOrWent) {
  struct Case {
    const char* steps;
    std::set<std::string> told;
    bool needsHandles = false;  ///< inotify does not say to which object it happened
  };
  const Case cases[] = {
      {"ln a/x c/z", {"a/x", "b/y", "c/z"}},
      {"rm b/y", {"b/y"}},
      {"rm a/x", {"a/x", "b/y"}},
      {"rm a/x; rm b/y", {"a/x", "b/y"}},
      {"write new; mv new b/y", {"b/y"}},
      {"rm a/x; write new; mv new b/y", {"a/x", "b/y"}},
      {"write new; mv new a/x; mkdir a/deep; mv b a/deep/b", {"a/x", "a/deep/b/y"}},
      {"rm a/x; mv b/y c/z", {"a/x", "b/y", "c/z"}},
      {"write a/x longer; mv a/x c/z", {"a/x", "b/y", "c/z"}},
      {"mv b d", {"d/y"}},
      {"mv a d", {"d/x"}},
      {"mv b .b", {".b/y"}},
      {"rm b", {"b/y"}},
      {"rm a", {"a/x", "b/y"}},
      {"write b/y longer; mv b ../out", {"a/x", "b/y"}},
      {"write a/x longer; mv a ../out", {"a/x", "b/y"}},
      {"write b/y longer; mv b/y ../out", {"a/x", "b/y"}},
      {"ln a/x ../out; mv ../out c/z; write c/z longer; mv c/z ../out", {"a/x", "b/y"}, true},
      {"ln a/x ../out; mv ../out c/z; write c/z longer; mv c ../outside", {"a/x", "b/y"}, true},
      {"mkdir d; ln a/x d/z; write d/z longer", {"a/x", "b/y", "d/z"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.steps);
    if (c.needsHandles && GetParam() == WatcherKind::inotify) continue;
    close();
    for (const char* used : {"../out", "../outside", ""})
      fs::remove_all(path(used));
    run("mkdir a; mkdir b; mkdir c; write a/x; look a/x; ln a/x b/y");
    const std::uint64_t id = file("b/y");
    const std::uint32_t document = this->document("b/y");
    const std::uint64_t since = anchor();
    run(c.steps);
    anchor();
    std::set<std::string> told;
    const auto records = index().events(since, 1000).value();
    for (const JournalRecord& record : records) {
      if (record.isDocument || record.fileID != id) continue;
      told.insert(record.path.substr(documents_.size() + 1));
    }
    EXPECT_THAT(told, ::testing::IsSupersetOf(c.told));
    if (index().pathOfFileID(id)) {
      EXPECT_EQ(index().fileIDOfDocument(document), id) << "another document";
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Watching, HardLinksTest,
                         ::testing::Values(std::nullopt, WatcherKind::folderMarks,
                                           WatcherKind::inotify));

// Random changes, watched and not, restarts and anchors in between: a client that applies the
// events holds what a fresh look shows.
class RandomReconciling
    : public ReconcilerTest,
      public ::testing::WithParamInterface<std::tuple<std::optional<WatcherKind>, int>> {
 protected:
  void SetUp() override {
    kind_ = std::get<0>(GetParam());
    if (!kind_) return;
    makeWatcher_ = [this] { return makeWatcher(*kind_); };
    const auto watcher = makeWatcher_();
    const UniqueFd folder(::open(documents_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!watcher || !(*watcher)->watch(folder.get(), 1)) GTEST_SKIP() << "not for this user";
  }

  std::size_t pick(std::size_t n) { return random_() % n; }

  std::vector<std::string> all(bool folders) const {
    std::vector<std::string> result;
    if (folders) result.emplace_back("");
    for (const auto& entry : fs::recursive_directory_iterator(documents_)) {
      if (fs::is_directory(entry.symlink_status()) == folders) {
        result.push_back(entry.path().native().substr(documents_.size() + 1));
      }
    }
    std::ranges::sort(result);
    return result;
  }
  std::string any(bool folders) {
    const auto names = all(folders);
    return names.empty() ? "" : names[pick(names.size())];
  }
  std::string newName() {
    static constexpr const char* names[] = {"a",         "b.txt", "c~",    ".hidden", "Inbox",
                                            "d.package", "e",     "f.txt", ".Trash",  "g.txt~"};
    const std::string folder = any(true);
    return (folder.empty() ? "" : folder + "/") + names[pick(std::size(names))];
  }

  static ino_t folderOf(const std::string& path) {
    struct stat status {};
    ::stat(fs::path(path).parent_path().c_str(), &status);
    return status.st_ino;
  }
  /// Takes note of the folders that are watched by now.
  void noteFolders() {
    known_.clear();
    for (const std::string& folder : all(true))
      known_.insert(folderOf(path(folder) + "/x"));
  }

  // Whatever the file system refuses is no change.
  void change() {
    const auto orNone = [&](const std::string& name) {
      return name.empty() ? base_ + "/none" : path(name);
    };
    const std::string file = orNone(any(false)), folder = orNone(any(true)), to = path(newName());
    // Of a name that came and left between two looks nobody says whose it was: not inotify, and
    // not a folder that came and left with it.
    const bool isHeard = kind_ != WatcherKind::inotify && (!kind_ || known_.contains(folderOf(to)));
    const auto write = [&] {
      const auto status = fs::symlink_status(to);
      if (!fs::exists(status) || fs::is_regular_file(status))
        std::ofstream(to) << std::string(pick(50), 'x');
    };
    const std::function<void()> changes[] = {
        write,
        write,
        [&] { ::mkdir(to.c_str(), 0755); },
        [&] { ::rename(file.c_str(), to.c_str()); },
        [&] { ::rename(folder.c_str(), to.c_str()); },
        [&] { fs::remove(file); },
        [&] {
          if (pick(3) == 0) fs::remove_all(folder);
        },
        [&] { fs::create_symlink("nowhere", to, ignored_); },
        [&] { ::renameat2(AT_FDCWD, file.c_str(), AT_FDCWD, to.c_str(), RENAME_EXCHANGE); },
        [&] {
          if (isHeard) fs::create_hard_link(file, to, ignored_);
        },
        [&] { ::chmod(file.c_str(), pick(2) == 0 ? 0600 : 0644); },
        [&] { ::chmod(folder.c_str(), pick(2) == 0 ? 0700 : 0755); }};
    changes[pick(std::size(changes))]();
  }

  std::optional<WatcherKind> kind_;
  std::set<ino_t> known_;
  std::error_code ignored_;
  std::mt19937 random_;
};

TEST_P(RandomReconciling, AreToldSoThatAClientHoldsWhatIsThere) {
  const auto seed = static_cast<unsigned>(seedOr(std::random_device{}()));
  SCOPED_TRACE("MIRABEL_TEST_SEED=" + std::to_string(seed));
  random_.seed(seed);
  for (int i = 0; i < 20; ++i)
    change();
  std::uint64_t since = anchor();
  Replicas replicas = everything();
  for (int round = 0; round < 12; ++round) {
    noteFolders();
    const std::size_t changes = 1 + pick(12);
    for (std::size_t i = 0; i < changes; ++i) {
      change();
      if (pick(6) == 0) list(any(true));
    }
    if (pick(2) == 0) close();
    catchUp(replicas, since);
    ASSERT_EQ(replicas, everything());
    since = anchor();
  }
  ASSERT_TRUE(index().reconcile());
  EXPECT_EQ(index().status().lastEventID, since) << "what was followed, a comparison confirms";
}

INSTANTIATE_TEST_SUITE_P(
    Sequences, RandomReconciling,
    ::testing::Combine(::testing::Values(std::nullopt, WatcherKind::folderMarks,
                                         WatcherKind::inotify, WatcherKind::fileSystemMark),
                       ::testing::Range(0, 25)));

}  // namespace
}  // namespace mirabel
