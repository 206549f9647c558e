#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "host/Watcher.h"
#include "host/bus/BusConnection.h"
#include "mirabel/Documents.h"

namespace mirabel::bus {

/// The containers that a client watches through the service. When the service comes back to the
/// bus, all are watched again, and told, for nobody knows what happened meanwhile.
class RemoteWatches {
 public:
  /// The connection outlives it.
  explicit RemoteWatches(BusConnection& connection) : connection_(connection) {}

  [[nodiscard]] static Result<std::unique_ptr<ContainerWatch>> add(
      const std::shared_ptr<RemoteWatches>& watches, const std::string& container,
      std::function<void()> changed);

  // On the connection's thread.

  void signalled(const std::string& container);
  void serviceMoved(bool isThere);

 private:
  class Entry;
  void remove(const std::string& container, const std::shared_ptr<Watcher>& watcher);
  [[nodiscard]] bool isWatched(const std::string& container);
  /// Asks the service to watch it; whoever does is woken by the answer.
  void askToWatch(const std::string& container);
  [[nodiscard]] std::vector<std::string> containers();

  BusConnection& connection_;
  std::mutex mutex_;  ///< for what follows; nobody is woken with it
  std::map<std::string, std::vector<std::shared_ptr<Watcher>>> watchers_;  ///< by container
};

}  // namespace mirabel::bus
