#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/ResourceValues.h"
#include "identity/AppLibraryRoots.h"
#include "platform/Platform.h"

namespace mirabel {

/// The mapping between file URLs and item identifiers, on the volume of the document storage.
/// Keeps no state of what it maps; any thread may call it. Nothing but `deviceIDWithError` fails
/// with an error: every operation logs and answers nothing.
class FileObjectURLs {
 public:
  /// What `platform` refers to, and `roots`, outlive this.
  FileObjectURLs(const Platform& platform, const AppLibraryRoots& roots);

  /// Number of the volume that holds `url`; a POSIX error where it cannot be had.
  [[nodiscard]] Result<DeviceID> deviceIDWithError(const URL& url) const;
  /// The same, 0 for an error.
  [[nodiscard]] DeviceID deviceID(const URL& url) const;

  /// Identifier of the object at `url`. Allocates a document ID on first sight of a document,
  /// and leaves what it learned in the URL's resource cache: asking for the same URL again, or
  /// for one that was prefetched, does not touch the disk.
  [[nodiscard]] std::optional<std::string> itemIdentifier(const URL& url) const;

  /// Whether it is the document folder of an app library.
  [[nodiscard]] bool isAppLibraryRoot(const URL& url) const;

  /// The URL of the root container, of "fid=N" and of "did=N"; the path as the volume returns it.
  /// The URL is made anew, with an empty resource cache. Blocks for up to 5 ms while the volume
  /// asks for patience.
  [[nodiscard]] std::optional<URL> fileURLWithItemIdentifier(std::string_view identifier) const;
  /// The same, and why there is none: nothing when the volume says that no object has the
  /// identifier, or it is of no form that identifiers have; POSIX and store errors when nothing is
  /// known.
  [[nodiscard]] Result<std::optional<URL>> findItem(std::string_view identifier) const;
  [[nodiscard]] std::optional<URL> fileURLWithFileIdentifier(std::uint64_t fileID) const;
  [[nodiscard]] std::optional<URL> _fileURLWithFileIdentifier(std::uint64_t fileID,
                                                              DeviceID device) const;

 private:
  [[nodiscard]] const URL* rootHolding(const URL& canonical,
                                       const std::vector<URL>& libraries) const;
  [[nodiscard]] std::optional<std::string> identifierOfObject(const URL& url) const;
  [[nodiscard]] bool isFolder(const URL& url) const;
  [[nodiscard]] std::optional<std::string> identifierFromDisk(const URL& url, bool isPackage) const;
  [[nodiscard]] std::optional<std::string> documentIdentifier(const URL& url, FileObject& object,
                                                              std::uint32_t assigned) const;
  [[nodiscard]] Result<std::optional<URL>> findAgain(std::string_view identifier) const;
  /// 0, with an error line, when there is none.
  [[nodiscard]] DeviceID documentStorageDevice() const;
  [[nodiscard]] std::optional<std::uint64_t> fileIDOfDocument(DeviceID device,
                                                              std::int64_t documentID) const;

  Platform platform_;
  const AppLibraryRoots& roots_;
  ResourceReader reader_;
  URL canonicalStorage_;  ///< document storage in the form in which paths are compared
};

}  // namespace mirabel
