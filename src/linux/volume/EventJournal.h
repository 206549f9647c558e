#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "linux/volume/Database.h"
#include "mirabel/Error.h"

namespace mirabel {

/// One record of the history. Either something happened at a path, or a document passed from one
/// object to another.
struct JournalRecord {
  std::uint64_t id = 0;
  bool isDocument = false;
  // Path records.
  std::uint64_t folder = 0;  ///< file ID of the folder that `path` lies in; 0 for a root
  std::string path;
  std::uint64_t fileID = 0;
  bool changedKind = false;  ///< a folder became a package, or stopped being one
  // Both; 0 in a path record of what is no document.
  std::uint32_t documentID = 0;
  // Document records; 0 for none.
  std::uint64_t source = 0;
  std::uint64_t destination = 0;
};

/// What is kept: no more records than these, and none that are older, to the hour.
struct Retention {
  std::uint64_t count = 1'000'000;  ///< weeks of work on a home
  std::chrono::seconds age = std::chrono::days(90);
};

/// The event history of a volume, tables of its database: written in the transactions that change
/// the index, so that the two never disagree. IDs are consecutive and never used twice. Used under
/// the lock of the index.
class EventJournal {
 public:
  using Now = std::function<std::chrono::system_clock::time_point()>;

  /// `database` outlives it.
  [[nodiscard]] static Result<std::unique_ptr<EventJournal>> open(
      Database& database, Now now = std::chrono::system_clock::now);

  /// Nothing is recorded before the first anchor is handed out: nobody could ask for it.
  [[nodiscard]] bool isActive() const { return isActive_; }
  [[nodiscard]] Result<void> activate();

  [[nodiscard]] Result<void> append(const JournalRecord& record);
  /// Writes what `append` counted, and when; to be called before the transaction ends.
  [[nodiscard]] Result<void> saveBounds();

  /// ID of the oldest record that is kept, or of the next one where none is.
  [[nodiscard]] std::uint64_t firstID() const { return firstID_; }
  /// ID of the last record; 0 before the first.
  [[nodiscard]] std::uint64_t lastID() const { return nextID_ - 1; }
  /// Whether every record after `since` is still here, and `since` was ever given out.
  [[nodiscard]] bool canReplay(std::uint64_t since) const {
    return isActive_ && since + 1 >= firstID_ && since < nextID_;
  }
  /// At most `limit` records after `since`, oldest first.
  [[nodiscard]] Result<std::vector<JournalRecord>> replay(std::uint64_t since, std::size_t limit);

  /// Forgets the records that need not be kept: none of them is replayed any more. Their rows go
  /// a few at a time, at most so many in one call that it takes no longer than writing did.
  [[nodiscard]] Result<void> prune(const Retention& retention);
  /// Forgets all records; their IDs stay used.
  [[nodiscard]] Result<void> startOver();

  /// Takes back what was counted since the transaction began; to be called after a rollback.
  [[nodiscard]] Result<void> reload();

 private:
  explicit EventJournal(Now now) : now_(std::move(now)) {}
  [[nodiscard]] std::int64_t seconds() const;
  [[nodiscard]] Result<void> noteTime();
  [[nodiscard]] Result<std::uint64_t> firstYoungerThan(std::int64_t time);
  [[nodiscard]] Result<void> removeRows();

  Now now_;
  std::vector<Statement> statements_;
  std::uint64_t firstID_ = 1;
  std::uint64_t nextID_ = 1;
  std::uint64_t savedNextID_ = 1;
  std::optional<std::int64_t> lastTime_;  ///< of the last row of times
  std::uint64_t appended_ = 0;            ///< since rows were removed last
  bool isActive_ = false;
};

}  // namespace mirabel
