#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <thread>

#include "linux/apps/ApplicationWatches.h"
#include "linux/apps/LocalNotificationCenter.h"
#include "linux/kernel/WakeUp.h"

namespace mirabel {

/// Posts the registry's notifications when applications, or their document folders, come, change or
/// go. Works on a thread of its own as long as it lives. It may post without need, for what turns
/// out to be the same; whoever hears it looks.
class ApplicationMonitor {
 public:
  struct Options {
    ApplicationPlaces places;
    ApplicationWatches::Bounds bounds{};
    /// How often it looks where the user has no watches left.
    std::chrono::milliseconds interval{2000};
  };
  /// What happens after this has returned is posted. The center outlives this.
  ApplicationMonitor(Options options, LocalNotificationCenter& center);
  /// Waits for what is under way.
  ~ApplicationMonitor();
  ApplicationMonitor(const ApplicationMonitor&) = delete;
  ApplicationMonitor& operator=(const ApplicationMonitor&) = delete;

  /// Whether the kernel tells of everything, so that it is posted at once. Otherwise changes are
  /// found by the times of folders, with a delay, and one that leaves those as they are (a file
  /// written in place) is missed. Any thread may ask.
  [[nodiscard]] bool isComplete() const { return isComplete_; }

 private:
  void run();
  [[nodiscard]] bool isStopped(std::chrono::milliseconds rest) const;
  [[nodiscard]] bool lookAtTimes();
  void post(const ApplicationWatches::Changes& changes);

  const Options options_;
  LocalNotificationCenter& center_;
  ApplicationWatches watches_;
  std::uint64_t times_ = 0;
  std::chrono::steady_clock::time_point lookedAt_;
  std::atomic<bool> isComplete_;
  WakeUp stop_;
  std::thread thread_;
};

/// A number that changes when an entry or a container is added to its folder or removed from it, as
/// far as the times of folders tell; of no more folders than the bounds allow to watch.
[[nodiscard]] std::uint64_t timesOfFolders(const ApplicationPlaces& places,
                                           const ApplicationWatches::Bounds& bounds);

}  // namespace mirabel
