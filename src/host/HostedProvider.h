#pragma once

#include <memory>

#include "applibrary/MRBAppLibraryManager.h"
#include "fs/FSChangesEnumerations.h"
#include "host/HostTrash.h"
#include "host/SearchableItems.h"
#include "linux/files/LinuxPlatform.h"
#include "linux/log/LoggingDiagnosticReporter.h"
#include "mirabel/Error.h"
#include "provider/LocalVessel.h"

namespace mirabel {

/// The provider of one home with all that it stands on, running in this process. It holds the
/// volume's state for as long as it lives. What its enumerators have under way must have ended
/// when it goes.
class HostedProvider {
 public:
  /// Returns when the app libraries are those that are installed now. Errors: those of
  /// `LinuxPlatform::open`.
  [[nodiscard]] static Result<std::unique_ptr<HostedProvider>> open(LinuxPlatform::Options options);
  ~HostedProvider();
  HostedProvider(const HostedProvider&) = delete;
  HostedProvider& operator=(const HostedProvider&) = delete;

  [[nodiscard]] LocalVessel& vessel() { return *vessel_; }
  [[nodiscard]] const LocalVessel& vessel() const { return *vessel_; }
  [[nodiscard]] HostTrash& trash() { return *trash_; }
  [[nodiscard]] MRBAppLibraryManager& libraries() const { return *libraries_; }
  [[nodiscard]] const Platform& platform() const { return platform_->platform(); }
  [[nodiscard]] const LinuxPlatform& linuxPlatform() const { return *platform_; }
  [[nodiscard]] const FileObjectURLs& identity() const { return *identity_; }
  [[nodiscard]] SearchableItems& searchableItems() { return *searchable_; }
  /// Keeps up with applications that are installed and removed, from the first look at them on.
  void watchApplications() { platform_->watchApplications(); }

 private:
  explicit HostedProvider(std::unique_ptr<LinuxPlatform> platform);

  std::unique_ptr<LinuxPlatform> platform_;
  std::unique_ptr<SearchableItems> searchable_;  // asked by the libraries from the first one on
  std::unique_ptr<MRBAppLibraryManager> libraries_;
  LoggingDiagnosticReporter diagnostics_;
  std::unique_ptr<FileObjectURLs> identity_;
  std::unique_ptr<FSChangesEnumerations> enumerations_;
  std::unique_ptr<HostTrash> trash_;  // what the provider has begun may still report to it
  std::unique_ptr<LocalVessel> vessel_;
};

}  // namespace mirabel
