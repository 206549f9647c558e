#pragma once

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <stop_token>
#include <string>
#include <thread>
#include <vector>

#include "host/ContainerWatches.h"
#include "host/HostedProvider.h"
#include "host/search/SearchFeeder.h"
#include "mirabel/Error.h"
#include "mirabel/SearchQuery.h"

namespace mirabel {

/// Searches the working set of a provider: brings the index in step with it before it answers, as
/// any host would. Answers are identifiers. Any thread may call it.
class Searching {
 public:
  /// The provider outlives it.
  explicit Searching(HostedProvider& provider) : provider_(provider) {}
  ~Searching();
  Searching(const Searching&) = delete;
  Searching& operator=(const Searching&) = delete;

  /// Ends what is under way: the index is no longer brought in step, and whoever waits for that is
  /// answered with POSIX ECANCELED.
  void stop() { stopping_.request_stop(); }

  /// Keeps the index in step in the background from now on, whether or not it is asked. `watches`
  /// outlives it. To be called once.
  void follow(ContainerWatches& watches);

  // Errors: those of opening the index, and of feeding it.

  [[nodiscard]] Result<std::vector<std::string>> search(const SearchQuery& query);
  [[nodiscard]] Result<std::vector<std::string>> recent(std::size_t limit);
  [[nodiscard]] Result<std::vector<std::string>> favorites(std::size_t limit);

 private:
  [[nodiscard]] Result<SearchIndex*> inStep();
  [[nodiscard]] static Result<void> beginWatch(ContainerWatches& watches,
                                               const std::function<void()>& changed,
                                               std::unique_ptr<ContainerWatch>& watch);
  [[nodiscard]] Result<void> feedOnce();
  void feed(const std::stop_token& stop, ContainerWatches& watches);

  HostedProvider& provider_;
  std::mutex mutex_;  ///< for what is made once
  std::unique_ptr<SearchFeeder> feeder_;
  std::shared_ptr<VesselEnumerator> workingSet_;
  std::stop_source stopping_;
  std::jthread feeding_;
};

}  // namespace mirabel
