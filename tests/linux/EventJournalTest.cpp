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
    journal_ = std::move(EventJournal::open(*database_).value());
  }
  void append(const std::string& path) {
    JournalRecord record;
    record.folder = 7;
    record.path = path;
    record.fileID = 8;
    ASSERT_TRUE(journal_->append(record));
    ASSERT_TRUE(journal_->saveBounds());
  }

  std::unique_ptr<Database> database_;
  std::unique_ptr<EventJournal> journal_;
};

TEST_F(EventJournalTest, KeepsNothingBeforeItIsActive) {
  append("/early");
  EXPECT_EQ(journal_->lastID(), 0u);
  EXPECT_FALSE(journal_->canReplay(0));
}

TEST_F(EventJournalTest, RecordsComeBackInOrderAndInPieces) {
  ASSERT_TRUE(journal_->activate());
  append("/a\xff");
  JournalRecord document;
  document.isDocument = true;
  document.documentID = 5;
  document.source = 1;
  document.destination = std::uint64_t{1} << 62;
  ASSERT_TRUE(journal_->append(document));
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
  EXPECT_FALSE(journal_->canReplay(4)) << "never given out";
}

TEST_F(EventJournalTest, PrunedEventsAreNotReplayedAndTheirNumbersNotUsedAgain) {
  ASSERT_TRUE(journal_->activate());
  for (int i = 0; i < 10; ++i)
    append("/x");
  ASSERT_TRUE(journal_->prune(3));
  EXPECT_FALSE(journal_->canReplay(6));
  EXPECT_TRUE(journal_->canReplay(7)) << "all after it are kept";
  EXPECT_EQ(journal_->replay(7, 100)->size(), 3u);
  ASSERT_TRUE(journal_->prune(0));
  journal_.reset();
  journal_ = std::move(EventJournal::open(*database_).value());
  EXPECT_EQ(journal_->lastID(), 10u);
  append("/y");
  EXPECT_EQ(journal_->lastID(), 11u);
}

}  // namespace
}  // namespace mirabel
