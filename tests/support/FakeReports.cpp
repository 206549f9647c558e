#include "support/FakeReports.h"

#include <utility>

namespace mirabel::testing {

void FakeReports::hold() {
  const std::lock_guard lock(mutex_);
  areHeld_ = true;
}

void FakeReports::release() {
  std::vector<std::function<void()>> due;
  {
    const std::lock_guard lock(mutex_);
    areHeld_ = false;
    due.swap(held_);
  }
  for (const auto& report : due)
    report();
}

std::size_t FakeReports::held() const {
  const std::lock_guard lock(mutex_);
  return held_.size();
}

void FakeReports::make(std::function<void()> report) {
  {
    const std::lock_guard lock(mutex_);
    if (areHeld_) return held_.push_back(std::move(report));
  }
  report();
}

}  // namespace mirabel::testing
