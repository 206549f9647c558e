#include <filesystem>
#include <set>

#include "linux/KilledProcess.h"
#include "linux/VolumeFixture.h"

namespace mirabel {
namespace {

namespace fs = std::filesystem;

constexpr const char* deep = "deep";

/// A process is killed in the middle of its work, after a copy of its files was taken.
class OlderCopies : public VolumeFixture {
 protected:
  std::string kept() const { return base_ + "/kept"; }

  /// As `cp` does it: into the file that is there.
  void putBack(const char* name) const {
    fs::copy_file(kept() + "/" + name, volumeFolder() + "/" + name,
                  fs::copy_options::overwrite_existing);
  }

  /// Files whose paths fill a page of the history each. Few in a folder: the threads that share a
  /// large one are not there in a forked process.
  void makeDeepFiles() const {
    std::string folder = deep;
    while (path(folder).size() < 3500)
      folder += "/" + std::string(200, 'n');
    for (int i = 0; i < 300; ++i) {
      const std::string part = folder + "/" + std::to_string(i / 30);
      makeFolder(part);
      write(part + "/" + std::to_string(i));
    }
  }
  /// As much as the log holds before it is moved into the database.
  void fillLog() {
    for (int round = 0; round < 16; ++round) {
      for (const auto& entry : fs::recursive_directory_iterator(path(deep))) {
        if (entry.is_regular_file()) fs::resize_file(entry, static_cast<unsigned>(round) + 2);
      }
      index().reconcile().value();
    }
  }

  /// Does work of which a copy is taken in between, is told of the last of it, and is killed.
  void work(bool isLong) {
    write("first");
    if (isLong) makeDeepFiles();
    history_ = index().historyUUID();
    anchor_ = index().currentEventID().value();
    first_ = document("first");
    close();
    KilledProcess process([&](const KilledProcess::Self& self) {
      write("early");
      index().currentEventID().value();
      self.say(std::to_string(document("early")));
      self.wait();
      if (isLong) fillLog();
      write("late");
      self.say(std::to_string(index().currentEventID().value()));
      self.say(std::to_string(document("late")));
    });
    early_ = process.line();
    fs::copy(volumeFolder(), kept(), fs::copy_options::recursive);
    process.goOn();
    lastAnchor_ = std::stoull(process.line());
    late_ = process.line();
  }

  void expectStartOver(bool isLong = false) {
    EXPECT_NE(index().historyUUID(), history_);
    EXPECT_EQ(notices_.size(), 1u);
    std::set<std::string> before{std::to_string(first_), early_, late_};
    for (int i = 0; i < 10; ++i) {
      const std::string name = "new" + std::to_string(i);
      write(name);
      EXPECT_TRUE(before.insert(std::to_string(document(name))).second) << name;
    }
    if (!isLong) {
      EXPECT_EQ(document("first"), first_);
      EXPECT_GT(index().currentEventID().value(), lastAnchor_) << "or nothing is shown";
    }
    const UUID renewed = index().historyUUID();
    close();
    EXPECT_EQ(index().historyUUID(), renewed) << "it is found out once";
    EXPECT_EQ(notices_.size(), 1u);
  }

  void expectGoesOn() {
    EXPECT_EQ(index().historyUUID(), history_);
    EXPECT_TRUE(notices_.empty());
    EXPECT_EQ(std::to_string(document("early")), early_);
    EXPECT_EQ(std::to_string(document("late")), late_);
    write("more");
    EXPECT_EQ(index().currentEventID().value(), lastAnchor_ + 1);
    const auto all = index().events(anchor_, 1'000'000).value();
    EXPECT_EQ(all.size(), lastAnchor_ + 1 - anchor_);
    EXPECT_EQ(index().events(lastAnchor_, 10)->back().path, path("more"));
  }

  UUID history_;
  std::uint64_t anchor_ = 0;
  std::uint64_t lastAnchor_ = 0;
  std::uint32_t first_ = 0;
  std::string early_;
  std::string late_;
};

struct Return {
  std::vector<const char*> files;    // put back
  std::vector<const char*> removed;  // after that
  bool isLong = false;               // the log was moved into the database after the copy
  bool goesOn = false;               // nothing that was told is missing
};

class OlderCopiesPutBack : public OlderCopies, public ::testing::WithParamInterface<Return> {};

TEST_P(OlderCopiesPutBack, AreFoundOutHoweverFarTheHistoryGoesOn) {
  work(GetParam().isLong);
  for (const char* name : GetParam().files)
    putBack(name);
  for (const char* name : GetParam().removed)
    fs::remove(volumeFolder() + "/" + name);
  GetParam().goesOn ? expectGoesOn() : expectStartOver(GetParam().isLong);
}

INSTANTIATE_TEST_SUITE_P(
    Each, OlderCopiesPutBack,
    ::testing::Values(Return{{}, {}, false, true}, Return{{}, {}, true, true},
                      Return{{"volume.db", "volume.db-wal"}, {}},
                      Return{{"volume.db"}, {}, false, true},
                      Return{{"volume.db"}, {"volume.db-wal"}}, Return{{"volume.db-wal"}, {}},
                      Return{{}, {"volume.db-wal"}}, Return{{"witness"}, {"volume.db-wal"}},
                      Return{{"volume.db", "volume.db-wal"}, {}, true},
                      Return{{"volume.db"}, {}, true}, Return{{"volume.db-wal"}, {}, true},
                      Return{{}, {"volume.db-wal"}, true}));

// Witness and all, as from a backup: only that it is a copy gives it away.
TEST_F(OlderCopies, AWholeStateThatIsPutBackIsFoundOut) {
  work(false);
  const std::string folder = volumeFolder();
  fs::remove_all(folder);
  fs::rename(kept(), folder);
  expectStartOver();
}

TEST_F(OlderCopies, TheOriginalThatIsPutBackAfterACopyWasUsedIsFoundOut) {
  work(false);
  const std::string folder = volumeFolder();
  fs::rename(folder, base_ + "/original");
  fs::rename(kept(), folder);
  const UUID other = index().historyUUID();
  close();
  fs::remove_all(folder);
  fs::rename(base_ + "/original", folder);
  notices_.clear();
  expectGoesOn();
  EXPECT_NE(index().historyUUID(), other) << "anchors of the copy are refused";
}

}  // namespace
}  // namespace mirabel
