#include "platform/ApplicationRegistry.h"

namespace mirabel {

std::string BundleProxy::description() const {
  return "<BundleProxy bundleIdentifier: " + bundleIdentifier.value_or("(null)") +
         ", dataContainerURL: " +
         (dataContainerURL ? dataContainerURL->description() : std::string("(null)")) + ">";
}

std::optional<BundleProxy> NoApplications::proxyForBundleIdentifier(std::string_view) {
  return {};
}

std::optional<BundleProxy> NoApplications::proxyAt(const URL&) {
  return {};
}

Result<void> NoApplications::enumerateApplicationsOfType(ApplicationType, const EnumerationBlock&) {
  return {};
}

std::optional<PropertyList> NoApplications::infoDictionaryValues(
    const BundleProxy&, std::span<const std::string_view>) {
  return PropertyList(PropertyList::Dictionary());
}

}  // namespace mirabel
