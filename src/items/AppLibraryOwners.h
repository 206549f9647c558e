#pragma once

#include <optional>
#include <string>

#include "foundation/URL.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// Finds the application whose document folder holds a URL. Any thread may call it.
class AppLibraryOwners {
 public:
  virtual ~AppLibraryOwners() = default;
  [[nodiscard]] virtual std::optional<BundleProxy> applicationOwning(const URL& url) const = 0;
};

/// Where no applications are known.
class NoAppLibraryOwners final : public AppLibraryOwners {
 public:
  [[nodiscard]] std::optional<BundleProxy> applicationOwning(const URL&) const override {
    return {};
  }
};

}  // namespace mirabel
