#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "identity/FileObjectURLs.h"
#include "items/LocalItem.h"
#include "platform/Platform.h"

namespace mirabel {

/// The principal object that the host calls. Entry points may be called from any thread; the
/// lookups hold no lock and keep no cache.
class LocalVessel {
 public:
  /// Everything passed in outlives the provider.
  LocalVessel(const Platform& platform, const AppLibraryRoots& roots,
              const AppLibraryOwners& owners);
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

  Platform platform_;
  FileObjectURLs identity_;
  ItemContext context_;
};

}  // namespace mirabel
