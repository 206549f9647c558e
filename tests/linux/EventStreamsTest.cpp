// Event streams on real folders, heard of by each kind of watcher.
#include <atomic>
#include <filesystem>
#include <fstream>

#include "linux/FailingWrites.h"
#include "linux/VolumeFixture.h"
#include "linux/events/LinuxEventStreams.h"
#include "linux/volume/FollowThread.h"
#include "platform/EventStreamsConformance.h"
#include "support/FakeEventStreams.h"
#include "support/NoDescriptors.h"
#include "support/TempHome.h"

namespace mirabel::testing {
namespace {

class FakeHistory final : public HistoryUnderTest {
 public:
  EventStreams& streams() override { return streams_; }
  std::string folder() const override { return "/documents/a"; }
  std::string otherFolder() const override { return "/documents/b"; }
  void change(const std::string& path) override { streams_.append(path, ++fileID_); }
  void save(const std::string& path) override {
    streams_.appendDocument(1, fileID_, fileID_ + 1);
    change(path);
  }
  void deliver() override { streams_.deliver(); }

 private:
  FakeEventStreams streams_;
  std::uint64_t fileID_ = 0;
};

class RealHistory final : public HistoryUnderTest {
 public:
  explicit RealHistory(WatcherKind kind) : roots_({home_.documents()}) {
    home_.makeFolder("a");
    home_.makeFolder("b");
    VolumeIndex::Options options;
    options.stateFolder = home_.stateFolder();
    options.volumePath = home_.documents();
    options.makeWatcher = [kind] { return makeWatcher(kind); };
    index_ = std::move(VolumeIndex::open(roots_, std::move(options)).value());
    streams_ = std::make_unique<LinuxEventStreams>(*index_);
  }
  EventStreams& streams() override { return *streams_; }
  std::string folder() const override { return home_.at("a"); }
  std::string otherFolder() const override { return home_.at("b"); }
  void change(const std::string& path) override { std::ofstream(path) << ++count_; }
  void save(const std::string& path) override {
    std::ofstream(path + ".new") << ++count_;
    std::filesystem::rename(path + ".new", path);
  }
  void deliver() override {}  // the kernel says so

 private:
  TempHome home_;
  MonitoredRoots roots_;
  std::unique_ptr<VolumeIndex> index_;
  std::unique_ptr<LinuxEventStreams> streams_;
  int count_ = 0;
};

HistoryFactory real(WatcherKind kind) {
  return [kind]() -> std::unique_ptr<HistoryUnderTest> {
    if (!makeWatcher(kind)) return nullptr;
    return std::make_unique<RealHistory>(kind);
  };
}

INSTANTIATE_TEST_SUITE_P(Fake, EventStreamsConformance,
                         ::testing::Values([] { return std::make_unique<FakeHistory>(); }));
INSTANTIATE_TEST_SUITE_P(FolderMarks, EventStreamsConformance,
                         ::testing::Values(real(WatcherKind::folderMarks)));
INSTANTIATE_TEST_SUITE_P(Inotify, EventStreamsConformance,
                         ::testing::Values(real(WatcherKind::inotify)));

// A thousand writes within the latency are one event of one file, told once it is over.
TEST(LinuxEventStreams, WritesToOneFileAreMerged) {
  RealHistory history(WatcherKind::folderMarks);
  const std::uint64_t since = history.streams().currentEventID().value();
  for (int i = 0; i < 20; ++i) {
    history.change(history.folder() + "/f");
    static_cast<void>(history.streams().currentEventID());
  }
  StreamListener listener(history);
  listener.startForPaths({history.folder()}, since);
  ASSERT_TRUE(listener.waitForFlag(eventflag::historyDone));
  EXPECT_EQ(listener.count(history.folder() + "/f"), 1u);
}

TEST(LinuxEventStreams, AnObjectThatADocumentPassedToIsToldFromOneThatWasWrittenTo) {
  RealHistory history(WatcherKind::folderMarks);
  const std::string written = history.folder() + "/written";
  const std::string saved = history.folder() + "/saved";
  history.change(written);
  history.change(saved);
  const std::uint64_t since = history.streams().currentEventID().value();
  history.change(written);
  history.save(saved);
  StreamListener listener(history);
  listener.startForPaths({history.folder()}, since);
  ASSERT_TRUE(listener.waitForFlag(eventflag::historyDone));
  EXPECT_EQ(listener.flags(written), 0U);
  EXPECT_EQ(listener.flags(saved), eventflag::changedObject);
}

TEST(LinuxEventStreams, LibrariesThatCouldNotBeFollowedAreBeforeTheNextEventID) {
  RealHistory history(WatcherKind::folderMarks);
  const TempHome apps;
  apps.makeFolder("library");
  const std::uint64_t before = history.streams().currentEventID().value();
  const std::vector<FollowedLibrary> libraries{{apps.url("library"), ""}};
  {
    const FailingWrites full(ENOSPC);
    EXPECT_FALSE(history.streams().followLibraries(libraries, 1));
    EXPECT_FALSE(history.streams().currentEventID());
  }
  const std::uint64_t since = history.streams().currentEventID().value();
  EXPECT_GE(since, before);
  history.change(apps.at("library/f"));
  StreamListener listener(history);
  listener.startForPaths({apps.at("library")}, since);
  EXPECT_TRUE(listener.waitForPath(apps.at("library/f")));
}

TEST(FollowThread, EndsAlsoWhereTheProcessMayHaveNoFurtherDescriptors) {
  if (NoDescriptors::areNeeded) GTEST_SKIP() << "the sanitizer takes descriptors itself";
  std::atomic<bool> hasLooked = false;
  {
    const NoDescriptors none;
    const FollowThread thread({[] { return nullptr; },
                               [&] {
                                 hasLooked = true;
                                 hasLooked.notify_all();
                               },
                               [] { return true; }});
    hasLooked.wait(false);
  }
  SUCCEED() << "it looked, and its end was not waited for in vain";
}

}  // namespace
}  // namespace mirabel::testing
