#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "enumeration/EnumerationServices.h"
#include "fs/FSChangesEnumerator.h"
#include "identity/FileObjectURLs.h"
#include "items/LocalItem.h"
#include "platform/EnumerationObservers.h"
#include "platform/Platform.h"

namespace mirabel {

/// The principal object that the host calls. Entry points may be called from any thread; the
/// lookups hold no lock and keep no cache.
class LocalVessel {
 public:
  /// Everything passed in outlives the provider. Without `changes` it has no enumerators.
  LocalVessel(const Platform& platform, const AppLibraryRoots& roots,
              const AppLibraryOwners& owners, std::optional<ChangeServices> changes = {});
  /// Ends the live updates of its enumerators.
  ~LocalVessel();
  LocalVessel(const LocalVessel&) = delete;
  LocalVessel& operator=(const LocalVessel&) = delete;

  using ErrorHandler = std::function<void(std::optional<Error>)>;

  /// Host entry points. The two lookups answer nothing where there is nothing, with a log line.
  [[nodiscard]] std::optional<URL> URLForItemWithPersistentIdentifier(
      std::string_view identifier) const;
  [[nodiscard]] std::optional<URL> _urlForItemWithPersistentIdentifier(
      std::string_view identifier) const;
  [[nodiscard]] std::optional<std::string> persistentIdentifierForItemAtURL(const URL& url) const;
  [[nodiscard]] std::optional<std::string> _persistentIdentifierForItemAt(const URL& url) const;
  /// Error: `LocalVesselError::invalidItemIdentifier`.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> itemForIdentifier(
      std::string_view identifier) const;
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> _propertiesForItemAtURL(const URL& url) const;

  /// The enumerator of a container, with its live updates started where they are wanted. It must
  /// not outlive the provider. Errors: those of `urlForIdentifier`; POSIX ENOTSUP for a provider
  /// without changes.
  [[nodiscard]] Result<std::shared_ptr<VesselEnumerator>> enumeratorForContainerItemIdentifier(
      std::string_view identifier, LiveUpdates liveUpdates = LiveUpdates::wanted);

  /// All content is local: these complete at once, without an error.
  void providePlaceholderAtURL(const URL& url, const ErrorHandler& completionHandler) const;
  void startProvidingItemAtURL(const URL& url, const ErrorHandler& completionHandler) const;
  void stopProvidingItemAtURL(const URL& url) const;
  void itemChangedAtURL(const URL& url) const;

  /// Lookups that the operations share. `urlForIdentifier` fails with the host's no-such-item
  /// error; `lookUpItem` logs nothing of its own. Items refer to this provider and to what was
  /// passed to it until their `putBackURL` was asked for.
  [[nodiscard]] Result<URL> urlForIdentifier(std::string_view identifier) const;
  [[nodiscard]] std::shared_ptr<LocalItem> lookUpItem(std::string_view identifier) const;
  [[nodiscard]] const ItemContext& itemContext() const { return context_; }
  [[nodiscard]] const Platform& platform() const { return platform_; }
  [[nodiscard]] const FileObjectURLs& identity() const { return identity_; }

 private:
  [[nodiscard]] std::shared_ptr<LocalItem> temporaryLocalFolder() const;
  [[nodiscard]] std::optional<std::string> identifierForURL(const URL& url) const;
  [[nodiscard]] Result<std::vector<URL>> foldersOf(std::string_view container) const;

  Platform platform_;
  const AppLibraryRoots& roots_;
  FileObjectURLs identity_;
  ItemContext context_;
  std::optional<ChangeServices> changes_;
  OpenWalks walks_;
  RunningReaders liveUpdates_;
};

}  // namespace mirabel
