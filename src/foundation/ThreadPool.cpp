#include "foundation/ThreadPool.h"

#include <condition_variable>
#include <deque>
#include <mutex>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

#include "foundation/FatalError.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Owned by the pool and by each of its threads, which are detached.
struct ThreadPool::State {
  explicit State(std::chrono::milliseconds timeout) : idleTimeout(timeout) {}

  const std::chrono::milliseconds idleTimeout;
  std::mutex mutex;
  std::condition_variable changed;   // work came, or the pool ends
  std::condition_variable finished;  // the last thread has gone
  std::deque<std::function<void()>> work;
  std::size_t threads = 0;
  std::size_t available = 0;  // threads that run nothing, those just being started included
  bool ending = false;

  void addThread(const std::shared_ptr<State>& self);
  void run() noexcept;
  bool awaitWork(std::unique_lock<std::mutex>& lock);
};

/// With the lock held.
void ThreadPool::State::addThread(const std::shared_ptr<State>& self) {
  try {
    std::thread([self] { self->run(); }).detach();
  } catch (const std::system_error& error) {
    // The threads that there are get to the work in time, unless there are none.
    if (threads == 0) fatalError(std::string("can't start a thread; ") + error.what());
    return;
  }
  ++threads;
  ++available;
}

void ThreadPool::State::run() noexcept {
  std::unique_lock lock(mutex);
  while (awaitWork(lock)) {
    std::function<void()> next = std::move(work.front());
    work.pop_front();
    --available;
    lock.unlock();
    next();
    next = nullptr;  // what it holds may take locks of its own when it goes
    lock.lock();
    ++available;
  }
  --available;
  if (--threads == 0) finished.notify_all();
}

/// False when the thread is to end.
bool ThreadPool::State::awaitWork(std::unique_lock<std::mutex>& lock) {
  changed.wait_for(lock, idleTimeout, [&] { return !work.empty() || ending; });
  return !work.empty();
}

ThreadPool::ThreadPool(std::chrono::milliseconds idleTimeout)
    : state_(std::make_shared<State>(idleTimeout)) {}

ThreadPool::~ThreadPool() {
  std::unique_lock lock(state_->mutex);
  state_->ending = true;
  state_->changed.notify_all();
  state_->finished.wait(lock, [&] { return state_->threads == 0; });
}

ThreadPool& ThreadPool::shared() {
  // Never destroyed: its threads may be at work while the process ends.
  static ThreadPool* const pool = new ThreadPool;
  return *pool;
}

void ThreadPool::submit(std::function<void()> work) {
  const std::lock_guard lock(state_->mutex);
  state_->work.push_back(std::move(work));
  if (state_->work.size() > state_->available) {
    state_->addThread(state_);
  } else {
    state_->changed.notify_one();
  }
}

std::size_t ThreadPool::threadCount() const {
  const std::lock_guard lock(state_->mutex);
  return state_->threads;
}

}  // namespace mirabel
