#include <cerrno>
#include <gtest/gtest.h>

#include "fs/GatherPhaseResumeCheck.h"
#include "support/FakeAppLibraries.h"
#include "support/FakeEventStreams.h"
#include "support/FakePlatform.h"
#include "support/LogCapture.h"

namespace mirabel::testing {
namespace {

using Verdict = FSEventReaderGatherPhaseResumeStatus::Case;

class GatherPhaseResumeCheckTest : public ::testing::Test {
 protected:
  GatherPhaseResumeCheckTest() {
    folderID = fake.volume.makeFolder(fake.path("folder")).fileID;
    fileID = fake.volume.writeFile(fake.path("file")).fileID;
    events.append(fake.path("gone before"), 4711);
  }
  GatherPhaseResumeCheck check(std::uint64_t since = 1) {
    auto result = canResumeGatherPhase(context, events, {fake.url()}, since);
    EXPECT_EQ(events.runningStreams(), 0U);
    return result;
  }

  FakePlatform fake;
  FakeAppLibraries libraries{fake.applications};
  FileObjectURLs identity{fake.platform(), libraries};
  ItemContext context{fake.platform(), identity, libraries};
  FakeEventStreams events;
  std::uint64_t folderID = 0, fileID = 0;
  LogCapture log;
};

TEST_F(GatherPhaseResumeCheckTest, ChangesAndMovesLetTheListingGoOn) {
  EXPECT_EQ(check().status.status, Verdict::canResume);
  EXPECT_EQ(check().lastProcessedFSEventID, 1U);
  events.append(fake.path("file"), fileID);
  events.append(fake.path("folder"), folderID);
  events.append(fake.path(".hidden"));
  auto result = check();
  EXPECT_EQ(result.status.status, Verdict::canResume);
  EXPECT_EQ(result.lastProcessedFSEventID, 4U);
  EXPECT_FALSE(result.hasNameLeft || result.hasFolderMoved);

  fake.volume.rename(fake.path("file"), fake.path("folder/file"));
  events.append(fake.path("file"), fileID);
  events.append(fake.path("folder/file"), fileID);
  result = check();
  EXPECT_EQ(result.status.status, Verdict::canResume);
  EXPECT_TRUE(result.hasNameLeft);
  EXPECT_FALSE(result.hasFolderMoved);

  fake.volume.rename(fake.path("folder"), fake.path("moved"));
  events.append(fake.path("folder"), folderID);
  EXPECT_TRUE(check().hasFolderMoved);
  // Nothing of it since then.
  EXPECT_FALSE(check(7).hasNameLeft);
}

TEST_F(GatherPhaseResumeCheckTest, GapInTheHistoryIsFoundOut) {
  using namespace eventflag;
  const Verdict gap = Verdict::cantReplayHistoricalFSEvents;
  EXPECT_EQ(check(2).status.status, gap);  // an ID that was never given out
  for (const std::uint32_t flags : {userDropped, kernelDropped, eventIDsWrapped}) {
    const std::uint64_t since = events.currentEventID().value();
    events.append({0, flags, {}, {}, {}});
    EXPECT_EQ(check(since).status.status, gap) << flags;
  }
  const std::uint64_t since = events.currentEventID().value();
  EXPECT_EQ(check(since).status.status, Verdict::canResume);
  events.append(fake.path("file"), fileID);
  events.prune(since + 1);
  EXPECT_EQ(check(since).status.status, gap);
}

TEST_F(GatherPhaseResumeCheckTest, StreamThatCannotBeHadIsNotWaitedFor) {
  events.failCreation(Error::posix(EMFILE));
  EXPECT_EQ(check().status.status, Verdict::cantReplayHistoricalFSEvents);
}

TEST_F(GatherPhaseResumeCheckTest, HistoryOfManyBatchesIsReadToItsEnd) {
  for (int i = 0; i < 20; ++i)
    events.append(fake.path("file"), fileID);
  events.append(fake.path("gone"), 4712);
  events.setBatchSize(3);
  EXPECT_EQ(check().status.status, Verdict::deletionOccurred);
  EXPECT_EQ(check(22).lastProcessedFSEventID, 22U);
}

}  // namespace
}  // namespace mirabel::testing
