#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/search/SearchFiles.h"
#include "mirabel/Error.h"
#include "mirabel/SearchQuery.h"
#include "mirabel/Values.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

class SearchLoad;
class SearchRun;
class SearchStore;

/// What is known of the items of the working set for finding them: a database of its own, which
/// can be made anew from a listing at any time. Its owner holds the lock of the folder that it lies
/// in. Answers are identifiers; what they stand for is looked up anew. Any thread may call it, and
/// none waits for a feed from nothing; only for as long as a batch takes.
///
/// Rows and anchor are one: whatever cuts a change short leaves the rows and the anchor of before,
/// or those of after. A database that turns out to be damaged is removed; the call that met it
/// fails, and there is no anchor from then on.
class SearchIndex {
 public:
  static constexpr std::string_view fileName = "search.db";
  using Notice = std::function<void(std::string_view)>;
  /// "search.db" in the folder, made where it is missing. One that is damaged or of another
  /// version is made anew, and `notice` told. POSIX errors: EBUSY when another process has it;
  /// ENOSPC. Else `ErrorDomain::store`.
  [[nodiscard]] static Result<std::unique_ptr<SearchIndex>> open(const std::string& folder,
                                                                 const Notice& notice = {});
  ~SearchIndex();
  SearchIndex(const SearchIndex&) = delete;
  SearchIndex& operator=(const SearchIndex&) = delete;

  /// Up to where the rows are good. Nothing when the working set has to be listed.
  [[nodiscard]] std::optional<Data> anchor();
  /// How many items it knows.
  [[nodiscard]] Result<std::uint64_t> count();

  /// New rows for all that there is. The former ones are searched until it is committed, and stay
  /// when it goes away before.
  class StartingOver {
   public:
    ~StartingOver();
    StartingOver(const StartingOver&) = delete;
    StartingOver& operator=(const StartingOver&) = delete;
    /// What is added again stands for what was.
    [[nodiscard]] Result<void> add(const VesselItems& items);
    /// On disk when it returns. Nothing may be added afterwards.
    [[nodiscard]] Result<void> commit(const Data& anchor);

   private:
    friend class SearchIndex;
    StartingOver(SearchIndex& index, std::shared_ptr<SearchLoad> load);
    SearchIndex& index_;
    std::shared_ptr<SearchLoad> load_;
  };
  /// One at a time, or else POSIX EBUSY. It must not outlive the index.
  [[nodiscard]] Result<std::unique_ptr<StartingOver>> startOver();

  /// A batch of changes and the anchor after them. On disk when it returns.
  [[nodiscard]] Result<void> apply(const VesselItems& updated,
                                   const std::vector<std::string>& deletedIdentifiers,
                                   const Data& anchor);
  /// Takes out what belongs to these applications. On disk when it returns; rows that are told
  /// again afterwards come back. While an index is made from nothing, what was added to it goes
  /// too.
  [[nodiscard]] Result<void> deleteDomains(const std::vector<std::string>& domains);

  /// What matches, the best first: where the worst of the words is a whole word of the name or of
  /// a tag, then where it begins one, then the others; among those what was modified last, and in
  /// the end by identifier. So the same rows give the same answer, whatever way they came.
  [[nodiscard]] Result<std::vector<std::string>> search(const SearchQuery& query);
  /// What was used or modified last, neither folders nor what is in the trash.
  [[nodiscard]] Result<std::vector<std::string>> recent(std::size_t limit);
  /// By rank, the lowest first, without what is in the trash.
  [[nodiscard]] Result<std::vector<std::string>> favorites();

  /// Gives back what it keeps in memory to answer sooner.
  void releaseMemory();

 private:
  explicit SearchIndex(SearchFiles files);
  [[nodiscard]] Result<void> openStore();
  [[nodiscard]] Result<void> makeAnew();
  void close();
  [[nodiscard]] Result<void> write(const std::function<Result<void>()>& work);
  template <class T>
  [[nodiscard]] Result<T> read(const std::function<Result<T>()>& work);
  void recoverFrom(const Error& error);
  [[nodiscard]] Result<void> replaceByNew();

  SearchFiles files_;
  /// Serialises what changes rows, and taken before mutex_.
  std::mutex writing_;
  std::mutex mutex_;
  /// With mutex_; null where it could not be opened, which is tried again.
  std::unique_ptr<SearchStore> store_;
  std::unique_ptr<SearchRun> run_;
  std::weak_ptr<SearchLoad> load_;
};

}  // namespace mirabel
