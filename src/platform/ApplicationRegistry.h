#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "foundation/URL.h"

namespace mirabel {

/// What the registry knows of one application.
struct BundleProxy {
  std::optional<std::string> bundleIdentifier;
  std::optional<URL> dataContainerURL;
  std::optional<std::string> localizedName;

  /// One line for logs: identifier and data container.
  [[nodiscard]] std::string description() const;
};

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
};

/// A machine without applications that expose documents.
class NoApplications final : public ApplicationRegistry {
 public:
  std::optional<BundleProxy> proxyForBundleIdentifier(std::string_view identifier) override;
  std::optional<BundleProxy> proxyAt(const URL& url) override;
};

}  // namespace mirabel
