#include "platform/ApplicationRegistry.h"

namespace mirabel {

std::optional<BundleProxy> NoApplications::proxyForBundleIdentifier(std::string_view) {
  return {};
}

std::optional<BundleProxy> NoApplications::proxyAt(const URL&) {
  return {};
}

}  // namespace mirabel
