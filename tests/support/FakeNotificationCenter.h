#pragma once

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/NotificationCenter.h"

namespace mirabel::testing {

/// Delivers on the thread that posts, before `post` returns. One thread at a time.
class FakeNotificationCenter final : public NotificationCenter {
 public:
  void addObserver(const void* observer, std::string_view name, Callback callback) override {
    observers_.push_back({observer, std::string(name), std::move(callback)});
  }
  void removeEveryObserver(const void* observer) override {
    std::erase_if(observers_, [&](const Observer& known) { return known.who == observer; });
  }
  void post(std::string_view name) {
    // Callbacks may remove observers, also those that would come next.
    const std::vector<Observer> before = observers_;
    for (const Observer& observer : before)
      if (observer.name == name && isKnown(observer.who)) observer.callback(name);
  }
  /// How many names are observed by how many, all told.
  [[nodiscard]] std::size_t observers() const { return observers_.size(); }

 private:
  struct Observer {
    const void* who;
    std::string name;
    Callback callback;
  };
  [[nodiscard]] bool isKnown(const void* who) const {
    return std::ranges::find(observers_, who, &Observer::who) != observers_.end();
  }
  std::vector<Observer> observers_;
};

}  // namespace mirabel::testing
