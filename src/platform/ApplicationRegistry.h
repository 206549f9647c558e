#pragma once

#include <memory>
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
};

/// The applications installed on this machine. Any thread may call it.
class ApplicationRegistry {
 public:
  virtual ~ApplicationRegistry() = default;
  [[nodiscard]] virtual std::optional<BundleProxy> proxyForBundleIdentifier(
      std::string_view identifier) = 0;
  /// The application whose document folder (its data container's "Documents") is at `url`.
  [[nodiscard]] virtual std::optional<BundleProxy> proxyAt(const URL& url) = 0;
};

/// A machine without applications that expose documents.
class NoApplications final : public ApplicationRegistry {
 public:
  std::optional<BundleProxy> proxyForBundleIdentifier(std::string_view) override { return {}; }
  std::optional<BundleProxy> proxyAt(const URL&) override { return {}; }
};

}  // namespace mirabel
