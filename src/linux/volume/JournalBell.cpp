#include "linux/volume/JournalBell.h"

#include <utility>

namespace mirabel {

std::uint64_t JournalBell::add(Listener listener) {
  const std::lock_guard lock(mutex_);
  listeners_.emplace(nextID_, std::move(listener));
  return nextID_++;
}

void JournalBell::remove(std::uint64_t id) {
  const std::lock_guard lock(mutex_);
  listeners_.erase(id);
}

bool JournalBell::hasListeners() const {
  const std::lock_guard lock(mutex_);
  return !listeners_.empty();
}

void JournalBell::ring(std::uint64_t lastID) {
  const std::lock_guard lock(mutex_);
  if (lastID <= toldID_) return;
  toldID_ = lastID;
  for (const auto& [id, listener] : listeners_)
    listener();
}

}  // namespace mirabel
