#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "foundation/Error.h"
#include "host/HostedProvider.h"

namespace mirabel {

/// The provider of one home, running inside this process. Owned by a command; holds the volume's
/// state for as long as it lives.
class Session {
 public:
  struct Options {
    std::optional<std::string> home;
    std::chrono::milliseconds timeout{30'000};
    std::function<void(std::string_view)> notice;
  };
  /// Errors: those of `LinuxPlatform::open`.
  [[nodiscard]] static Result<std::unique_ptr<Session>> open(Options options);

  [[nodiscard]] const LocalVessel& provider() const { return hosted_->vessel(); }
  [[nodiscard]] LocalVessel& provider() { return hosted_->vessel(); }
  [[nodiscard]] HostTrash& trash() { return hosted_->trash(); }
  [[nodiscard]] MRBAppLibraryManager& libraries() const { return hosted_->libraries(); }
  /// Lists the container and tells its changes, when it is asked. Errors: see `LocalVessel`.
  [[nodiscard]] Result<std::shared_ptr<VesselEnumerator>> enumerator(
      std::string_view container, LiveUpdates liveUpdates = LiveUpdates::unwanted) {
    return provider().enumeratorForContainerItemIdentifier(container, liveUpdates);
  }
  /// Why the documents of the application are left out of what is shown, in words, if they are for
  /// another reason than that it shows none.
  [[nodiscard]] std::optional<std::string> reasonLeftOut(std::string_view bundle) const;
  /// Keeps up with applications that are installed and removed, see `HostedProvider`.
  void watchApplications() { hosted_->watchApplications(); }
  [[nodiscard]] const Platform& platform() const { return hosted_->platform(); }
  [[nodiscard]] const LinuxPlatform& linuxPlatform() const { return hosted_->linuxPlatform(); }

 private:
  explicit Session(std::unique_ptr<HostedProvider> hosted) : hosted_(std::move(hosted)) {}
  std::unique_ptr<HostedProvider> hosted_;
};

}  // namespace mirabel
