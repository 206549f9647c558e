#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "host/HostedProvider.h"
#include "host/Watcher.h"
#include "mirabel/Documents.h"

namespace mirabel {

/// Wakes those who watch containers of a provider: whoever's container has changes, and nobody
/// else. The provider's signals say that something has changed in some container; what has not
/// been told is found by asking each watched one. Any thread may call it.
class ContainerWatches {
 public:
  /// Takes the provider's signals. The provider outlives this. Also without a signal it is asked
  /// each `interval` whether there are events: a stream that could not go on reading the history
  /// signals nothing any more.
  explicit ContainerWatches(HostedProvider& provider,
                            std::chrono::milliseconds interval = std::chrono::seconds(5));
  /// The watches must have ended.
  ~ContainerWatches();
  ContainerWatches(const ContainerWatches&) = delete;
  ContainerWatches& operator=(const ContainerWatches&) = delete;

  /// `changed` is called on a thread of this class, one call at a time. Once the watch is gone it
  /// is called no more, and no call is under way, unless it is that call which ended the watch.
  /// Errors: see `Documents::container`.
  enum class Wake {
    forChanges,
    forAnySignal,  ///< perhaps for nothing: for who asks for the changes anyway
  };
  [[nodiscard]] Result<std::unique_ptr<ContainerWatch>> add(const std::string& identifier,
                                                            std::function<void()> changed,
                                                            Wake wake = Wake::forChanges);

 private:
  class Watched;
  class Entry;

  void remove(const std::shared_ptr<Watcher>& watcher);
  void run();
  void check();

  /// What the provider's threads ring; one that is ringing keeps it.
  struct Bell {
    std::mutex mutex;
    std::condition_variable rung;
    bool isSignalled = false;
    bool mustEnd = false;
  };

  HostedProvider& provider_;
  const std::chrono::milliseconds interval_;
  std::shared_ptr<Bell> bell_ = std::make_shared<Bell>();
  std::mutex mutex_;  ///< for what follows
  /// Apart by what wakes: an anchor is only as good as the last question for its changes.
  std::map<std::pair<std::string, Wake>, std::shared_ptr<Watched>> watched_;
  std::thread thread_;
};

}  // namespace mirabel
