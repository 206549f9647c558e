#include "foundation/SerialQueue.h"

#include <condition_variable>
#include <deque>
#include <mutex>
#include <utility>

#include "foundation/FatalError.h"
#include "mirabel/Error.h"

namespace mirabel {

/// The queue's turn is a token: `taken` is true while somebody holds it. Its holder runs one
/// block after the other and hands the turn on: to the next block, to a caller of `sync` that
/// waits for it, or to nobody when no block is left.
struct SerialQueue::State : std::enable_shared_from_this<State> {
  /// A caller of `sync` that waits for its turn, on its own stack.
  struct Waiter {
    std::condition_variable granted;
    bool hasTurn = false;
  };
  /// Exactly one of the two is set.
  struct Entry {
    std::function<void()> block;
    Waiter* waiter = nullptr;
  };
  class Turn;

  State(std::string name, ThreadPool& threads) : label(std::move(name)), pool(threads) {}

  const std::string label;
  ThreadPool& pool;
  std::mutex mutex;
  std::deque<Entry> entries;
  bool taken = false;

  void drainOnPool();
  void drain();
  bool takeBlock(std::function<void()>& block);
  bool giveAway();
  void takeTurn();
  void handOn();
};

/// Marks the calling thread as running on a queue. Marks nest: a block may call `sync` of another
/// queue, whose block then runs on both.
class SerialQueue::State::Turn {
 public:
  explicit Turn(const State& queue) : queue_(queue), outer_(innermost) { innermost = this; }
  ~Turn() { innermost = outer_; }
  Turn(const Turn&) = delete;
  Turn& operator=(const Turn&) = delete;

  static bool isOn(const State& queue) {
    for (const Turn* turn = innermost; turn != nullptr; turn = turn->outer_) {
      if (&turn->queue_ == &queue) return true;
    }
    return false;
  }

 private:
  static thread_local const Turn* innermost;
  const State& queue_;
  const Turn* outer_;
};

thread_local const SerialQueue::State::Turn* SerialQueue::State::Turn::innermost = nullptr;

void SerialQueue::State::drainOnPool() {
  pool.submit([self = shared_from_this()] { self->drain(); });
}

/// Runs blocks until none is left or the turn goes to a waiting caller. The calling thread holds
/// the turn.
void SerialQueue::State::drain() {
  const Turn turn(*this);
  std::function<void()> block;
  while (takeBlock(block)) {
    block();
    block = nullptr;
  }
}

/// The next block. False when the turn was given away.
bool SerialQueue::State::takeBlock(std::function<void()>& block) {
  const std::lock_guard lock(mutex);
  if (giveAway()) return false;
  block = std::move(entries.front().block);
  entries.pop_front();
  return true;
}

/// With the lock held: gives the turn to the caller of `sync` that comes next, or to nobody when
/// nothing is left. False when a block comes next.
bool SerialQueue::State::giveAway() {
  if (entries.empty()) {
    taken = false;
    return true;
  }
  Waiter* const waiter = entries.front().waiter;
  if (waiter == nullptr) return false;
  entries.pop_front();
  // Notified under the lock: the waiter is gone as soon as it has seen its turn.
  waiter->hasTurn = true;
  waiter->granted.notify_one();
  return true;
}

/// Waits until the calling thread holds the turn, behind everything that was submitted before.
void SerialQueue::State::takeTurn() {
  std::unique_lock lock(mutex);
  if (!taken) {
    taken = true;
    return;
  }
  Waiter waiter;
  entries.push_back({nullptr, &waiter});
  waiter.granted.wait(lock, [&] { return waiter.hasTurn; });
}

/// Ends the turn of a caller of `sync`. Blocks that came in the meantime are not for that
/// caller's thread to run.
void SerialQueue::State::handOn() {
  {
    const std::lock_guard lock(mutex);
    if (giveAway()) return;
  }
  drainOnPool();
}

SerialQueue::SerialQueue(std::string label, ThreadPool& pool)
    : state_(std::make_shared<State>(std::move(label), pool)) {}

void SerialQueue::async(std::function<void()> block) {
  {
    const std::lock_guard lock(state_->mutex);
    state_->entries.push_back({std::move(block), nullptr});
    if (state_->taken) return;
    state_->taken = true;
  }
  state_->drainOnPool();
}

void SerialQueue::sync(const std::function<void()>& block) {
  const std::shared_ptr<State> state = state_;
  if (State::Turn::isOn(*state)) {
    fatalError("sync on queue \"" + state->label + "\" from one of its own blocks");
  }
  struct HeldTurn {
    explicit HeldTurn(State& queue) : queue_(queue) { queue_.takeTurn(); }
    ~HeldTurn() { queue_.handOn(); }
    State& queue_;
  };
  const HeldTurn held(*state);
  const State::Turn turn(*state);
  block();
}

void SerialQueue::syncWithWhatFollows(const std::function<void()>& block) {
  const std::shared_ptr<State> state = state_;
  if (State::Turn::isOn(*state)) {
    fatalError("sync on queue \"" + state->label + "\" from one of its own blocks");
  }
  state->takeTurn();
  {
    const State::Turn turn(*state);
    block();
  }
  state->drain();
}

bool SerialQueue::isCurrent() const {
  return State::Turn::isOn(*state_);
}

void SerialQueue::assertOnQueue() const {
  if (!isCurrent()) fatalError("not running on queue \"" + state_->label + "\"");
}

const std::string& SerialQueue::label() const {
  return state_->label;
}

}  // namespace mirabel
