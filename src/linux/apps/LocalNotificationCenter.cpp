#include "linux/apps/LocalNotificationCenter.h"

#include <cstdint>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "foundation/SerialQueue.h"

namespace mirabel {

struct LocalNotificationCenter::State {
  struct Observer {
    const void* who;
    std::string name;
    std::shared_ptr<const Callback> callback;
  };

  std::vector<std::uint64_t> observersOf(const std::string& name) {
    const std::lock_guard lock(mutex);
    pending.erase(name);
    std::vector<std::uint64_t> numbers;
    for (const auto& [number, observer] : observers)
      if (observer.name == name) numbers.push_back(number);
    return numbers;
  }

  // Null for one that was removed, which may have been done by the callback before it.
  std::shared_ptr<const Callback> callbackOf(std::uint64_t number) {
    const std::lock_guard lock(mutex);
    const auto found = observers.find(number);
    return found == observers.end() ? nullptr : found->second.callback;
  }

  void deliver(const std::string& name) {
    for (const std::uint64_t number : observersOf(name))
      if (const auto callback = callbackOf(number)) (*callback)(name);
  }

  SerialQueue queue{"mirabel.notification-center"};
  std::mutex mutex;
  std::map<std::uint64_t, Observer> observers;  // in the order in which they came
  std::uint64_t nextNumber = 0;
  std::set<std::string, std::less<>> pending;
};

LocalNotificationCenter::LocalNotificationCenter() : state_(std::make_shared<State>()) {}

LocalNotificationCenter::~LocalNotificationCenter() {
  {
    const std::lock_guard lock(state_->mutex);
    state_->observers.clear();
  }
  state_->queue.sync([] {});
}

void LocalNotificationCenter::addObserver(const void* observer, std::string_view name,
                                          Callback callback) {
  auto shared = std::make_shared<const Callback>(std::move(callback));
  const std::lock_guard lock(state_->mutex);
  state_->observers.emplace(state_->nextNumber++,
                            State::Observer{observer, std::string(name), std::move(shared)});
}

void LocalNotificationCenter::removeEveryObserver(const void* observer) {
  {
    const std::lock_guard lock(state_->mutex);
    std::erase_if(state_->observers,
                  [observer](const auto& entry) { return entry.second.who == observer; });
  }
  // A callback of it that had begun is waited for, unless it is the one that calls.
  if (!state_->queue.isCurrent()) state_->queue.sync([] {});
}

void LocalNotificationCenter::post(std::string_view name) {
  const std::lock_guard lock(state_->mutex);
  const auto [pending, isNew] = state_->pending.emplace(name);
  if (!isNew) return;
  state_->queue.async([state = state_, text = *pending] { state->deliver(text); });
}

}  // namespace mirabel
