#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>

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
  void remove(const Entry* entry);
  void watchAgain(const std::string& container);
  void wakeAll();

  BusConnection& connection_;
  /// Recursive, for a call that wakes may end its own watch.
  std::recursive_mutex mutex_;
  struct Watching {
    std::string container;
    std::function<void()> changed;
  };
  std::map<const Entry*, Watching> watching_;
};

}  // namespace mirabel::bus
