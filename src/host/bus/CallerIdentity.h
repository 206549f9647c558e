#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "mirabel/Error.h"

namespace sdbus {
class IConnection;
class IProxy;
}  // namespace sdbus

namespace mirabel::bus {

/// Who calls.
struct CallerIdentity {
  /// The application whose sandbox the caller runs in; nothing for a program outside of any. Empty
  /// for a sandbox of which no application is known.
  std::optional<std::string> sandboxedApplication;
};

/// What a sandbox says of itself in a file "/.flatpak-info": the application, empty where the file
/// names none.
[[nodiscard]] std::string applicationOfSandbox(std::string_view flatpakInfo);

/// Finds out who calls, by the process that the bus says is at the other end of the connection. Any
/// thread.
class CallerIdentities {
 public:
  CallerIdentities();
  ~CallerIdentities();

  /// POSIX EACCES for another user's program; ESRCH for one that has left.
  [[nodiscard]] Result<CallerIdentity> identify(const std::string& uniqueName);

 private:
  std::mutex asking_;  ///< for the connection; never held while files are looked at
  std::unique_ptr<sdbus::IConnection> connection_;
  std::unique_ptr<sdbus::IProxy> daemon_;
};

}  // namespace mirabel::bus
