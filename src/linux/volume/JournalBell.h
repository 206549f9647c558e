#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>

namespace mirabel {

/// Tells those who follow a journal that it has grown. Any thread may call it.
class JournalBell {
 public:
  using Listener = std::function<void()>;

  /// `listener` is called on the thread that made the journal grow, outside of the index's lock; it
  /// must return soon, and not call the bell.
  [[nodiscard]] std::uint64_t add(Listener listener);
  /// When it returns, that listener is not running and will not be called again.
  void remove(std::uint64_t id);
  [[nodiscard]] bool hasListeners() const;

  /// Calls the listeners when `lastID` is beyond what they were told of last.
  void ring(std::uint64_t lastID);

 private:
  mutable std::mutex mutex_;
  std::map<std::uint64_t, Listener> listeners_;
  std::uint64_t nextID_ = 1;
  std::uint64_t toldID_ = 0;
};

}  // namespace mirabel
