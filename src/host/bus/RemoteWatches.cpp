#include "host/bus/RemoteWatches.h"

#include <utility>

#include "host/bus/BusNames.h"

namespace mirabel::bus {
namespace {

BusConnection::Write named(const std::string& container) {
  return [container](sdbus::Message& call) { call << container; };
}

}  // namespace

class RemoteWatches::Entry final : public ContainerWatch {
 public:
  Entry(std::shared_ptr<RemoteWatches> watches, std::string container,
        std::shared_ptr<Watcher> watcher)
      : watches_(std::move(watches)),
        container_(std::move(container)),
        watcher_(std::move(watcher)) {}
  ~Entry() override { watches_->remove(container_, watcher_); }
  Entry(const Entry&) = delete;
  Entry& operator=(const Entry&) = delete;

 private:
  std::shared_ptr<RemoteWatches> watches_;
  std::string container_;
  std::shared_ptr<Watcher> watcher_;
};

Result<std::unique_ptr<ContainerWatch>> RemoteWatches::add(
    const std::shared_ptr<RemoteWatches>& watches, const std::string& container,
    std::function<void()> changed) {
  const auto watcher = std::make_shared<Watcher>(std::move(changed));
  {
    // Before it is asked for, so that no signal comes too early.
    const std::lock_guard lock(watches->mutex_);
    watches->watchers_[container].push_back(watcher);
  }
  auto entry = std::make_unique<Entry>(watches, container, watcher);
  const auto begun = watches->connection_.call(providerInterface, "Watch", named(container),
                                               [](sdbus::Message&) { return true; });
  if (!begun) return fail(begun.error());
  return entry;
}

void RemoteWatches::remove(const std::string& container, const std::shared_ptr<Watcher>& watcher) {
  watcher->end();
  {
    const std::lock_guard lock(mutex_);
    const auto watched = watchers_.find(container);
    std::erase(watched->second, watcher);
    if (!watched->second.empty()) return;
    watchers_.erase(watched);
  }
  // A service that does not hear it has left, or sees us leave.
  connection_.callAsync(providerInterface, "Unwatch", named(container),
                        [](sdbus::Message*, const Error&) {});
  // Who began to watch it while the others' end was on its way is not to be ended with them.
  if (isWatched(container)) askToWatch(container);
}

bool RemoteWatches::isWatched(const std::string& container) {
  const std::lock_guard lock(mutex_);
  return watchers_.contains(container);
}

void RemoteWatches::askToWatch(const std::string& container) {
  connection_.callAsync(providerInterface, "Watch", named(container),
                        [this, container](sdbus::Message*, const Error&) { signalled(container); });
}

void RemoteWatches::signalled(const std::string& container) {
  std::vector<std::shared_ptr<Watcher>> woken;
  {
    const std::lock_guard lock(mutex_);
    const auto watched = watchers_.find(container);
    if (watched != watchers_.end()) woken = watched->second;
  }
  for (const auto& watcher : woken)
    watcher->wake();
}

std::vector<std::string> RemoteWatches::containers() {
  const std::lock_guard lock(mutex_);
  std::vector<std::string> watched;
  watched.reserve(watchers_.size());
  for (const auto& [container, watchers] : watchers_)
    watched.push_back(container);
  return watched;
}

void RemoteWatches::serviceMoved(bool isThere) {
  for (const std::string& container : containers()) {
    if (isThere) {
      askToWatch(container);
    } else {
      signalled(container);
    }
  }
}

}  // namespace mirabel::bus
