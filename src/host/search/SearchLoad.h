#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <semaphore>
#include <string>
#include <unordered_set>
#include <vector>

#include "foundation/SerialQueue.h"
#include "host/search/SearchFiles.h"
#include "host/search/SearchStore.h"
#include "mirabel/Error.h"
#include "mirabel/Values.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// An index that is made from nothing, in a file of its own, which goes away with this unless it
/// was finished. It is written on a queue, while the next page is listed. Any thread may call it.
class SearchLoad {
 public:
  /// `files` outlives it.
  [[nodiscard]] static Result<std::unique_ptr<SearchLoad>> begin(const SearchFiles& files);
  ~SearchLoad();
  SearchLoad(const SearchLoad&) = delete;
  SearchLoad& operator=(const SearchLoad&) = delete;

  /// What is added again stands for what was. Returns before it is written, and waits where much
  /// is still to be; errors are those of calls before.
  [[nodiscard]] Result<void> add(VesselItems items);
  /// Of what was added so far. Returns when it is done; a failure ends the load.
  void removeDomains(const std::vector<std::string>& domains);
  /// Completes and closes the file, which can take the place of the former index then.
  [[nodiscard]] Result<void> finish(const Data& anchor);

 private:
  explicit SearchLoad(const SearchFiles& files) : files_(files) {}
  [[nodiscard]] Result<void> outcome();
  /// Runs on the queue what has not failed yet.
  void run(const std::function<Result<void>()>& work);
  [[nodiscard]] Result<void> write(const VesselItems& items);

  const SearchFiles& files_;
  std::unique_ptr<SearchStore> store_;  ///< on the queue; null once it is finished
  bool isFinished_ = false;             ///< on the queue
  /// Of the identifiers that were added, on the queue: a listing hardly ever tells one twice.
  std::unordered_set<std::size_t> hashes_;
  std::mutex mutex_;
  Result<void> outcome_;  ///< with mutex_; of everything so far
  std::counting_semaphore<> pages_{8};
  SerialQueue queue_{"mirabel.search-load"};
};

}  // namespace mirabel
