#pragma once

#include <functional>
#include <memory>
#include <thread>

#include "linux/kernel/WakeUp.h"
#include "linux/watch/FolderWatcher.h"

namespace mirabel {

/// Takes in what the kernel tells as it comes, so that its queue does not overflow and those who
/// wait for changes are woken.
class FollowThread {
 public:
  struct Work {
    /// The watcher there is now; null when nothing is watched.
    std::function<std::shared_ptr<FolderWatcher>()> watcher;
    /// Brings the index in step.
    std::function<void()> catchUp;
    /// Asked once a second: whether something may have changed that no record tells of.
    std::function<bool()> isDue;
  };
  explicit FollowThread(Work work);
  /// Waits for what is under way.
  ~FollowThread();
  FollowThread(const FollowThread&) = delete;
  FollowThread& operator=(const FollowThread&) = delete;

 private:
  void run();
  [[nodiscard]] bool isStopped(int milliseconds) const;

  Work work_;
  WakeUp stop_;
  std::thread thread_;
};

}  // namespace mirabel
