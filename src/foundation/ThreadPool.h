#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace mirabel {

/// Threads that are lent to whoever has work. Grows while every thread is busy, so that blocked
/// work starves nobody, and shrinks again when threads have idled for a while. Destroying it
/// waits for the work that was submitted.
class ThreadPool {
 public:
  explicit ThreadPool(std::chrono::milliseconds idleTimeout = std::chrono::seconds(5));
  ~ThreadPool();
  ThreadPool(const ThreadPool&) = delete;
  ThreadPool& operator=(const ThreadPool&) = delete;

  /// The pool of the process, made on first use and never destroyed.
  static ThreadPool& shared();

  void submit(std::function<void()> work);
  [[nodiscard]] std::size_t threadCount() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
