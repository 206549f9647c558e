#pragma once

#include <functional>
#include <string_view>

namespace mirabel {

/// The application registry's notifications. Neither says which application it is about, and an
/// application that changed is one that is registered.
namespace notification {
inline constexpr std::string_view applicationRegistered =
    "com.norvane.Kestrel.applicationRegistered";
inline constexpr std::string_view applicationUnregistered =
    "com.norvane.Kestrel.applicationUnregistered";
}  // namespace notification

/// Tells observers that something happened. Notifications of one name that come while one of them
/// still waits to be delivered are delivered once. Any thread may call it.
class NotificationCenter {
 public:
  virtual ~NotificationCenter() = default;

  /// Called with the name of the notification, on the center's thread, one call at a time. It must
  /// return soon.
  using Callback = std::function<void(std::string_view name)>;
  /// `observer` is an address that stands for whoever observes, and is never looked at. One that
  /// observes a name twice is called twice.
  virtual void addObserver(const void* observer, std::string_view name, Callback callback) = 0;
  /// When it returns, no callback of the observer runs, and none will. From a callback it returns
  /// at once, and the callback that called it goes on. An observer that is not known is none.
  virtual void removeEveryObserver(const void* observer) = 0;
};

}  // namespace mirabel
