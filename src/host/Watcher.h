#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <utility>

namespace mirabel {

/// Somebody who watches a container: what is to be called when it changes, until that has ended.
/// Any thread.
class Watcher {
 public:
  explicit Watcher(std::function<void()> changed)
      : changed_(std::make_shared<std::function<void()>>(std::move(changed))) {}

  void wake() {
    const std::lock_guard lock(mutex_);
    // It stays until the call is over, also where the call itself ends this.
    if (const auto changed = changed_) (*changed)();
  }
  /// No call begins from now on, and none is under way once this has returned, unless it is called
  /// from within one.
  void end() {
    const std::lock_guard lock(mutex_);
    changed_.reset();
  }

 private:
  std::recursive_mutex mutex_;
  std::shared_ptr<std::function<void()>> changed_;
};

}  // namespace mirabel
