#pragma once

#include "foundation/ResourceValues.h"
#include "linux/files/ObjectLook.h"
#include "linux/files/PackageTypes.h"

namespace mirabel {

/// Resource values from the file system, and identities from the volume's index. Objects below
/// the roots are reached without following a symbolic link or entering another mount; paths may
/// be of any length.
class LinuxResourceValues final : public ResourceValueSource {
 public:
  explicit LinuxResourceValues(const LookContext& context) : context_(context) {}

  /// `noSuchFile` where the name, or a folder on the way to it, is not there.
  Result<ResourceValues> readValues(const URL& url) override;
  bool mayBePackage(std::string_view name) const override {
    return PackageTypes::isPackageName(name);
  }
  Result<void> prefetch(std::span<const URL> urls) override;

 private:
  LookContext context_;
};

}  // namespace mirabel
