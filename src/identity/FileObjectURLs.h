#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/ResourceValues.h"
#include "identity/AppLibraryRoots.h"
#include "platform/Platform.h"

namespace mirabel {

/// The mapping between file URLs and item identifiers, on the volume of the document storage.
/// Keeps no state; any thread may call it. Nothing fails with an error: every operation logs and
/// answers nothing.
class FileObjectURLs {
 public:
  FileObjectURLs(const Platform& platform, const AppLibraryRoots& roots);

  /// Number of the volume that holds `url`; a POSIX error where it cannot be had.
  [[nodiscard]] Result<DeviceID> deviceIDWithError(const URL& url) const;
  /// The same, 0 for an error.
  [[nodiscard]] DeviceID deviceID(const URL& url) const;

  /// Identifier of the object at `url`. Allocates a document ID on first sight of a document,
  /// and leaves what it learned in the URL's resource cache.
  [[nodiscard]] std::optional<std::string> itemIdentifier(const URL& url) const;

  /// The URL of the root container, of "fid=N" and of "did=N"; the path as the volume returns it.
  [[nodiscard]] std::optional<URL> fileURLWithItemIdentifier(std::string_view identifier) const;
  [[nodiscard]] std::optional<URL> fileURLWithFileIdentifier(std::uint64_t fileID) const;
  [[nodiscard]] std::optional<URL> _fileURLWithFileIdentifier(std::uint64_t fileID,
                                                              DeviceID device) const;

 private:
  Platform platform_;
  const AppLibraryRoots& roots_;
  ResourceReader reader_;
};

}  // namespace mirabel
