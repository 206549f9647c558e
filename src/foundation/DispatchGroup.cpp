#include "foundation/DispatchGroup.h"

#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <utility>
#include <vector>

#include "foundation/FatalError.h"
#include "foundation/SerialQueue.h"
#include "mirabel/Error.h"

namespace mirabel {

struct DispatchGroup::State {
  struct Notification {
    SerialQueue queue;
    std::function<void()> block;
  };

  std::mutex mutex;
  std::condition_variable emptied;
  std::uint64_t count = 0;
  // How often the count came down to zero: a waiter that wakes late must not miss a zero because
  // somebody has entered since.
  std::uint64_t timesEmptied = 0;
  std::vector<Notification> notifications;
};

DispatchGroup::DispatchGroup() : state_(std::make_shared<State>()) {}

void DispatchGroup::enter() {
  const std::lock_guard lock(state_->mutex);
  ++state_->count;
}

void DispatchGroup::leave() {
  // The caller may drop the last handle as soon as a waiter has woken.
  const std::shared_ptr<State> state = state_;
  std::vector<State::Notification> due;
  {
    const std::lock_guard lock(state->mutex);
    if (state->count == 0) fatalError("dispatch group left more often than entered");
    if (--state->count > 0) return;
    ++state->timesEmptied;
    due.swap(state->notifications);
    state->emptied.notify_all();
  }
  for (State::Notification& notification : due) {
    notification.queue.async(std::move(notification.block));
  }
}

bool DispatchGroup::wait(std::chrono::milliseconds timeout) {
  const std::shared_ptr<State> state = state_;
  std::unique_lock lock(state->mutex);
  const std::uint64_t before = state->timesEmptied;
  return state->emptied.wait_for(
      lock, timeout, [&] { return state->count == 0 || state->timesEmptied != before; });
}

void DispatchGroup::wait() {
  const std::shared_ptr<State> state = state_;
  std::unique_lock lock(state->mutex);
  const std::uint64_t before = state->timesEmptied;
  state->emptied.wait(lock, [&] { return state->count == 0 || state->timesEmptied != before; });
}

void DispatchGroup::notify(SerialQueue queue, std::function<void()> block) {
  {
    const std::lock_guard lock(state_->mutex);
    if (state_->count > 0) {
      state_->notifications.push_back({std::move(queue), std::move(block)});
      return;
    }
  }
  queue.async(std::move(block));
}

}  // namespace mirabel
