#include "identity/MRBFileObjectIdentifier.h"

#include "foundation/Log.h"

namespace mirabel {

std::string MRBFileObjectIdentifier::fromFileID(std::uint64_t fileID) {
  return "fid=" + std::to_string(fileID);
}

std::string MRBFileObjectIdentifier::fromDocumentID(std::uint64_t documentID) {
  return "did=" + std::to_string(documentID);
}

std::string MRBFileObjectIdentifier::fromBundleProxy(const BundleProxy& proxy) {
  return "#" + proxy.bundleIdentifier.value_or("(null)");
}

std::optional<std::string> MRBFileObjectIdentifier::fromAppLibraryDataContainerURL(
    ApplicationRegistry& registry, const URL& url) {
  const std::optional<BundleProxy> proxy = registry.proxyAt(url);
  if (proxy) return fromBundleProxy(*proxy);
  logError("can't find bundle proxy at " + url.description());
  return {};
}

}  // namespace mirabel
