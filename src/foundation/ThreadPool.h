#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>

namespace mirabel {

/// Threads that are lent to whoever has work. Grows while every thread is busy, so that blocked
/// work starves nobody, and shrinks again when threads have idled for a while. Destroying it
/// waits for the work that was submitted, and for what that work submits; so its own threads may
/// not destroy it.
class ThreadPool {
 public:
  explicit ThreadPool(std::chrono::milliseconds idleTimeout = std::chrono::seconds(5));
  ~ThreadPool();
  ThreadPool(const ThreadPool&) = delete;
  ThreadPool& operator=(const ThreadPool&) = delete;

  /// The pool of the process, made on first use and never destroyed.
  static ThreadPool& shared();

  /// Runs `work` soon, on some thread, in no particular order to other work. Work that throws
  /// ends the process. Any thread.
  void submit(std::function<void()> work);
  /// Threads that exist now, working or idle.
  [[nodiscard]] std::size_t threadCount() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
