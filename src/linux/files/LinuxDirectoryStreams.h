#pragma once

#include "linux/kernel/MonitoredRoots.h"
#include "platform/DirectoryStreams.h"

namespace mirabel {

/// Directory streams read straight from the kernel, 32 KiB at a time, and from a position on 8 KiB
/// at a time.
class LinuxDirectoryStreams final : public DirectoryStreams {
 public:
  /// `roots` outlives the streams.
  explicit LinuxDirectoryStreams(const MonitoredRoots& roots) : roots_(roots) {}

  Result<std::unique_ptr<DirectoryStream>> open(const URL& folder) override;
  Result<std::unique_ptr<DirectoryStream>> openAt(const URL& folder,
                                                  std::uint64_t position) override;

 private:
  const MonitoredRoots& roots_;
};

}  // namespace mirabel
