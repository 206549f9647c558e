#include "host/bus/RemoteWatches.h"

#include <algorithm>
#include <set>
#include <utility>
#include <vector>

#include "host/bus/BusNames.h"

namespace mirabel::bus {
namespace {

BusConnection::Write named(const std::string& container) {
  return [container](sdbus::Message& call) { call << container; };
}

}  // namespace

class RemoteWatches::Entry final : public ContainerWatch {
 public:
  explicit Entry(std::shared_ptr<RemoteWatches> watches) : watches_(std::move(watches)) {}
  ~Entry() override { watches_->remove(this); }
  Entry(const Entry&) = delete;
  Entry& operator=(const Entry&) = delete;

 private:
  std::shared_ptr<RemoteWatches> watches_;
};

Result<std::unique_ptr<ContainerWatch>> RemoteWatches::add(
    const std::shared_ptr<RemoteWatches>& watches, const std::string& container,
    std::function<void()> changed) {
  auto entry = std::make_unique<Entry>(watches);
  {
    // Before it is asked for, so that no signal comes too early.
    const std::lock_guard lock(watches->mutex_);
    watches->watching_[entry.get()] = {container, std::move(changed)};
  }
  const auto begun = watches->connection_.call(providerInterface, "Watch", named(container),
                                               [](sdbus::Message&) { return true; });
  if (!begun) return fail(begun.error());
  return entry;
}

void RemoteWatches::remove(const Entry* entry) {
  std::string container;
  {
    const std::lock_guard lock(mutex_);
    const auto found = watching_.find(entry);
    container = std::move(found->second.container);
    watching_.erase(found);
    const bool isWatchedStill = std::any_of(watching_.begin(), watching_.end(), [&](auto& other) {
      return other.second.container == container;
    });
    if (isWatchedStill) return;
  }
  // A service that does not hear it has left, or sees us leave.
  connection_.callAsync(providerInterface, "Unwatch", named(container),
                        [](sdbus::Message*, const Error&) {});
  watchAgain(container);
}

// Who began to watch it while the others' end was on its way is not to be ended with them.
void RemoteWatches::watchAgain(const std::string& container) {
  {
    const std::lock_guard lock(mutex_);
    const bool isWatched = std::any_of(watching_.begin(), watching_.end(), [&](auto& other) {
      return other.second.container == container;
    });
    if (!isWatched) return;
  }
  connection_.callAsync(providerInterface, "Watch", named(container),
                        [this, container](sdbus::Message*, const Error&) { signalled(container); });
}

void RemoteWatches::signalled(const std::string& container) {
  const std::lock_guard lock(mutex_);
  std::vector<std::function<void()>> woken;
  for (const auto& [entry, watching] : watching_)
    if (watching.container == container) woken.push_back(watching.changed);
  for (const auto& wake : woken)
    wake();
}

void RemoteWatches::wakeAll() {
  const std::lock_guard lock(mutex_);
  std::vector<std::function<void()>> woken;
  woken.reserve(watching_.size());
  for (const auto& [entry, watching] : watching_)
    woken.push_back(watching.changed);
  for (const auto& wake : woken)
    wake();
}

void RemoteWatches::serviceMoved(bool isThere) {
  if (!isThere) return wakeAll();
  std::set<std::string> containers;
  {
    const std::lock_guard lock(mutex_);
    for (const auto& [entry, watching] : watching_)
      containers.insert(watching.container);
  }
  for (const std::string& container : containers) {
    connection_.callAsync(
        providerInterface, "Watch", named(container),
        [this, container](sdbus::Message*, const Error&) { signalled(container); });
  }
}

}  // namespace mirabel::bus
