#include <cerrno>

#include "fs/GatherPhaseResumeCheck.h"
#include "support/FakeEventStreams.h"
#include "support/ItemsFixture.h"

namespace mirabel::testing {
namespace {

using Verdict = FSEventReaderGatherPhaseResumeStatus::Case;

class GatherPhaseResumeCheckTest : public ItemsFixture {
 protected:
  GatherPhaseResumeCheckTest() {
    fileID = fake.volume.writeFile(fake.path("file")).fileID;
    events.append(fake.path("gone before"), 4711);
  }
  GatherPhaseResumeCheck check(std::uint64_t since = 1) {
    auto result = canResumeGatherPhase(context, events, {fake.url()}, since);
    EXPECT_EQ(events.runningStreams(), 0U);
    return result;
  }

  FakeEventStreams events;
  std::uint64_t fileID = 0;
};

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
