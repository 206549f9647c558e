#pragma once

#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "identity/AppLibraryRoots.h"
#include "items/AppLibraryOwners.h"
#include "support/FakePlatform.h"

namespace mirabel::testing {

/// The libraries of the applications that are installed on a fake platform.
class FakeAppLibraries final : public AppLibraryRoots, public AppLibraryOwners {
 public:
  explicit FakeAppLibraries(const FakeApplications& applications) : applications_(applications) {}

  List rootURLsForAppLibraries() const override {
    auto roots = std::make_shared<std::vector<URL>>();
    for (const URL& folder : folders())
      roots->push_back(folder.properURL());
    return roots;
  }

  std::vector<URL> folders() const override {
    std::vector<URL> folders;
    for (const BundleProxy& proxy : applications_.installed) {
      if (proxy.dataContainerURL) folders.push_back(documents(proxy));
    }
    return folders;
  }

  std::optional<BundleProxy> applicationOwning(const URL& url) const override {
    for (const BundleProxy& proxy : applications_.installed) {
      if (!proxy.dataContainerURL) continue;
      if (url.path().starts_with(documents(proxy).path() + "/")) return proxy;
    }
    return {};
  }

 private:
  static URL documents(const BundleProxy& proxy) {
    return proxy.dataContainerURL->appendingPathComponent("Documents");
  }

  const FakeApplications& applications_;
};

}  // namespace mirabel::testing
