#pragma once

#include "linux/kernel/MonitoredRoots.h"
#include "platform/VesselManager.h"

namespace mirabel {

/// Sums the sizes of the regular files below a folder: a file with several names counts once,
/// symbolic links and special files count nothing, other file systems are not entered. What
/// vanishes meanwhile is left out; a folder that cannot be read is an error, since the sum would
/// be too small. Depth is bounded by memory only.
class LinuxDirectorySizer final : public DirectorySizer {
 public:
  /// `roots` outlives the sizer.
  explicit LinuxDirectorySizer(const MonitoredRoots& roots) : roots_(roots) {}

  Result<std::uint64_t> directorySize(const URL& folder) override;

 private:
  const MonitoredRoots& roots_;
};

}  // namespace mirabel
