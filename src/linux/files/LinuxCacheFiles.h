#pragma once

#include <string>
#include <utility>

#include "foundation/URL.h"
#include "platform/CacheFiles.h"

namespace mirabel {

/// Cache files on disk. A file is replaced by a rename, under a lock of its folder, so that two
/// processes that write the same one need no more than one temporary name and leave nothing behind.
///
/// The greatest number that was claimed under a name stands, in decimal digits and a newline, in
/// the file "version-NAME" of the state folder. Where those bytes are damaged, the numbers go on
/// from the time of day: greater than any that was given out by counting, at fewer than a million
/// a second.
class LinuxCacheFiles final : public CacheFiles {
 public:
  /// The state folder exists by the time a number is claimed.
  LinuxCacheFiles(URL applicationSupport, std::string stateFolder)
      : applicationSupport_(std::move(applicationSupport)), stateFolder_(std::move(stateFolder)) {}

  const URL& applicationSupportURL() const override { return applicationSupport_; }
  /// A symbolic link in place of the file is ELOOP, anything else that is no file EINVAL.
  Result<std::optional<Data>> read(const URL& file, std::size_t limit) override;
  Result<void> createDirectory(const URL& folder) override;
  Result<void> replace(const URL& file, const Data& bytes) override;
  Result<std::uint64_t> claimVersion(std::string_view name, std::uint64_t after) override;

 private:
  URL applicationSupport_;
  std::string stateFolder_;
};

}  // namespace mirabel
