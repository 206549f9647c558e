#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "applibrary/MRBAppLibraryManager.h"
#include "foundation/Error.h"
#include "fs/FSChangesEnumerator.h"
#include "host/HostTrash.h"
#include "linux/files/LinuxPlatform.h"
#include "linux/log/LoggingDiagnosticReporter.h"
#include "provider/LocalVessel.h"

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

  [[nodiscard]] const LocalVessel& provider() const { return *provider_; }
  [[nodiscard]] LocalVessel& provider() { return *provider_; }
  [[nodiscard]] HostTrash& trash() { return *trash_; }
  [[nodiscard]] MRBAppLibraryManager& libraries() { return *libraries_; }
  /// Lists the container and tells its changes, when it is asked. Errors: see `LocalVessel`.
  [[nodiscard]] Result<std::shared_ptr<VesselEnumerator>> enumerator(
      std::string_view container, LiveUpdates liveUpdates = LiveUpdates::unwanted) {
    return provider_->enumeratorForContainerItemIdentifier(container, liveUpdates);
  }
  [[nodiscard]] const Platform& platform() const { return platform_->platform(); }
  [[nodiscard]] const LinuxPlatform& linuxPlatform() const { return *platform_; }

 private:
  Session() = default;
  std::unique_ptr<LinuxPlatform> platform_;
  std::unique_ptr<MRBAppLibraryManager> libraries_;
  LoggingDiagnosticReporter diagnostics_;
  std::unique_ptr<FileObjectURLs> identity_;
  std::unique_ptr<FSChangesEnumerations> enumerations_;
  std::unique_ptr<HostTrash> trash_;  // what the provider has begun may still report to it
  std::unique_ptr<LocalVessel> provider_;
};

}  // namespace mirabel
