#pragma once

#include <memory>
#include <string_view>

#include "platform/NotificationCenter.h"

namespace mirabel {

/// Notifications within this process. Idle, it costs no thread. Must not be destroyed from a
/// callback; what was posted and is not delivered by then is dropped.
class LocalNotificationCenter final : public NotificationCenter {
 public:
  LocalNotificationCenter();
  ~LocalNotificationCenter() override;
  LocalNotificationCenter(const LocalNotificationCenter&) = delete;
  LocalNotificationCenter& operator=(const LocalNotificationCenter&) = delete;

  void addObserver(const void* observer, std::string_view name, Callback callback) override;
  void removeEveryObserver(const void* observer) override;

  /// Returns at once. Observers that are added before it is delivered hear of it as well.
  void post(std::string_view name);

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace mirabel
