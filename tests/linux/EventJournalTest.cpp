#include <filesystem>

#include "linux/VolumeFixture.h"
#include "linux/volume/Database.h"
#include "linux/volume/EventJournal.h"

namespace mirabel {
namespace {

class EventJournalTest : public VolumeFixture {
 protected:
  void SetUp() override {
    database_ = std::move(Database::open(base_ + "/journal.db").value());
    reopen();
  }
  void reopen() {
    journal_.reset();
    journal_ = std::move(EventJournal::open(*database_, [this] { return now_; }).value());
  }
  void append(const std::string& path) {
    ASSERT_TRUE(journal_->append({.folder = 7, .path = path, .fileID = 8}));
    ASSERT_TRUE(journal_->saveBounds());
  }

  std::uint64_t rowCount(const char* table) {
    auto rows = database_->prepare(std::string("SELECT count(*) FROM ") + table).value();
    EXPECT_TRUE(rows.step().value());
    return rows.unsignedInteger(0);
  }

  std::chrono::system_clock::time_point now_ = std::chrono::sys_days(std::chrono::days(22'000));
  std::unique_ptr<Database> database_;
  std::unique_ptr<EventJournal> journal_;
};

TEST_F(EventJournalTest, RecordsComeBackInOrderAndInPiecesOnceItIsActive) {
  append("/early");
  EXPECT_EQ(journal_->lastID(), 0u);
  EXPECT_FALSE(journal_->canReplay(0));
  ASSERT_TRUE(journal_->activate());
  append("/a\xff");
  ASSERT_TRUE(journal_->append({.isDocument = true,
                                .path = "",
                                .documentID = 5,
                                .source = 1,
                                .destination = std::uint64_t{1} << 62}));
  append("/b");
  const auto first = journal_->replay(0, 2).value();
  ASSERT_EQ(first.size(), 2u);
  EXPECT_EQ(first[0].path, "/a\xff");
  EXPECT_EQ(first[0].folder, 7u);
  EXPECT_TRUE(first[1].isDocument);
  EXPECT_EQ(first[1].destination, std::uint64_t{1} << 62);
  const auto rest = journal_->replay(first.back().id, 2).value();
  ASSERT_EQ(rest.size(), 1u);
  EXPECT_EQ(rest[0].id, journal_->lastID());
}

TEST_F(EventJournalTest, PrunedEventsAreNotReplayedAndTheirNumbersNotUsedAgain) {
  ASSERT_TRUE(journal_->activate());
  for (int i = 0; i < 10; ++i)
    append("/x");
  ASSERT_TRUE(journal_->prune({.count = 3}));
  EXPECT_FALSE(journal_->canReplay(6));
  EXPECT_TRUE(journal_->canReplay(7)) << "all after it are kept";
  EXPECT_EQ(journal_->replay(7, 100)->size(), 3u);
  ASSERT_TRUE(journal_->prune({.count = 0}));
  reopen();
  EXPECT_EQ(journal_->lastID(), 10u);
  append("/y");
  EXPECT_EQ(journal_->lastID(), 11u);
  ASSERT_TRUE(journal_->startOver());
  EXPECT_FALSE(journal_->canReplay(10));
  reopen();
  append("/z");
  EXPECT_EQ(journal_->replay(11, 10)->size(), 1u);
}

// An event a quarter of an hour, for four days; three are to be kept.
TEST_F(EventJournalTest, RecordsAreForgottenAtAnAgeThatIsRightToTheHour) {
  using namespace std::chrono_literals;
  constexpr std::chrono::seconds age = std::chrono::days(3);
  ASSERT_TRUE(journal_->activate());
  std::vector<std::chrono::system_clock::time_point> written{{}};
  for (int i = 1; i <= 4 * 24 * 4; ++i) {
    now_ += 15min;
    append("/x");
    written.push_back(now_);
    if (i % 50 == 0) reopen();
    if (i % 7 != 0) continue;
    ASSERT_TRUE(journal_->prune({.age = age}));
    std::size_t first = 1;
    while (!journal_->canReplay(first - 1))
      ++first;
    EXPECT_GE(written[first], now_ - age - 1h) << "older than need be";
    if (first > 1) {
      EXPECT_LE(written[first - 1], now_ - age) << "forgotten too soon";
    }
    EXPECT_EQ(journal_->replay(first - 1, 1000)->size(), written.size() - first);
  }
  EXPECT_LE(rowCount("event_times"), 3 * 24 + 2u);

  // After a long silence nothing is left, and who was up to date still is.
  const std::uint64_t last = journal_->lastID();
  now_ += age + 2h;
  ASSERT_TRUE(journal_->prune({.age = age}));
  EXPECT_FALSE(journal_->canReplay(last - 1));
  EXPECT_TRUE(journal_->canReplay(last));
  EXPECT_EQ(rowCount("events"), 0u);
  append("/y");
  EXPECT_EQ(journal_->replay(last, 10)->size(), 1u);
}

TEST_F(EventJournalTest, AClockThatIsSetBackKeepsNothingForEver) {
  using std::chrono::days;
  ASSERT_TRUE(journal_->activate());
  append("/now");
  now_ += days(36'500);
  append("/future");
  now_ -= days(36'500);
  append("/back");
  ASSERT_TRUE(journal_->prune({.age = days(1)}));
  EXPECT_TRUE(journal_->canReplay(0));
  now_ += days(2);
  ASSERT_TRUE(journal_->prune({.age = days(1)}));
  EXPECT_FALSE(journal_->canReplay(2));
  EXPECT_TRUE(journal_->canReplay(3));
}

// What was written in one go must not hold up a later commit by going in one go.
TEST_F(EventJournalTest, ManyRecordsAreForgottenAtOnceAndRemovedInPieces) {
  constexpr std::uint64_t count = 35'000;
  ASSERT_TRUE(journal_->activate());
  ASSERT_TRUE(database_->execute("BEGIN"));
  for (std::uint64_t i = 0; i < count; ++i)
    ASSERT_TRUE(journal_->append({.path = "/x"}));
  ASSERT_TRUE(journal_->saveBounds());
  ASSERT_TRUE(database_->execute("COMMIT"));
  reopen();
  std::uint64_t rows = count;
  for (int calls = 0; rows > 10; ++calls) {
    ASSERT_LT(calls, 5);
    ASSERT_TRUE(journal_->prune({.count = 10}));
    EXPECT_FALSE(journal_->canReplay(count - 11));
    EXPECT_EQ(journal_->replay(count - 10, 100)->size(), 10u);
    const std::uint64_t left = rowCount("events");
    EXPECT_LE(rows - left, 10'000u);
    rows = left;
  }
}

}  // namespace
}  // namespace mirabel
