#pragma once

#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "foundation/PropertyList.h"
#include "foundation/URL.h"
#include "mirabel/Error.h"

namespace mirabel {

/// What the registry knows of one application.
struct BundleProxy {
  std::optional<std::string> bundleIdentifier;
  std::optional<URL> dataContainerURL;
  std::optional<std::string> localizedName;
  /// It opens documents where they lie.
  bool supportsOpenInPlace = false;
  /// It lets others see its document folder.
  bool fileSharingEnabled = false;

  /// One line for logs: identifier and data container.
  [[nodiscard]] std::string description() const;
};

/// Who installed an application; the registry's own numbers.
enum class ApplicationType : int { user = 0, system = 2 };

/// The applications installed on this machine. Any thread may call it.
class ApplicationRegistry {
 public:
  virtual ~ApplicationRegistry() = default;
  /// Nothing for an identifier that no application has, the empty one among them.
  [[nodiscard]] virtual std::optional<BundleProxy> proxyForBundleIdentifier(
      std::string_view identifier) = 0;
  /// The application whose document folder (its data container's "Documents") is at `url`; both
  /// are compared in canonical form, see `URL::properURL`.
  [[nodiscard]] virtual std::optional<BundleProxy> proxyAt(const URL& url) = 0;

  /// Reports nothing in place of an entry that is there and can't be read.
  using EnumerationBlock = std::function<void(const std::optional<BundleProxy>&)>;
  /// Calls `block` for each application of the type, before it returns. Entries may be anybody's,
  /// so an implementation bounds their number, and the length of what it tells of one: all of it
  /// together has to fit into a keyed archive, or the list can't be kept. POSIX errors: not all of
  /// them were reported, and nothing can be said of those that were not.
  [[nodiscard]] virtual Result<void> enumerateApplicationsOfType(ApplicationType type,
                                                                 const EnumerationBlock& block) = 0;
  /// A dictionary of those of the keys that the application's info dictionary has, which may be
  /// none; nothing when the dictionary can't be read.
  [[nodiscard]] virtual std::optional<PropertyList> infoDictionaryValues(
      const BundleProxy& application, std::span<const std::string_view> keys) = 0;
};

/// A machine without applications that expose documents.
class NoApplications final : public ApplicationRegistry {
 public:
  std::optional<BundleProxy> proxyForBundleIdentifier(std::string_view identifier) override;
  std::optional<BundleProxy> proxyAt(const URL& url) override;
  Result<void> enumerateApplicationsOfType(ApplicationType type,
                                           const EnumerationBlock& block) override;
  std::optional<PropertyList> infoDictionaryValues(const BundleProxy& application,
                                                   std::span<const std::string_view> keys) override;
};

}  // namespace mirabel
