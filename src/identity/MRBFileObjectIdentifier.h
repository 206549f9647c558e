#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/URL.h"
#include "platform/ApplicationRegistry.h"

namespace mirabel {

/// The maker of identifier strings: "fid=N" for an object named by its file ID, "did=N" for a
/// document, "#bundle" for the document folder of an application.
class MRBFileObjectIdentifier {
 public:
  static std::string fromFileID(std::uint64_t fileID);
  static std::string fromDocumentID(std::uint64_t documentID);
  /// "#(null)" for a proxy without a bundle identifier.
  static std::string fromBundleProxy(const BundleProxy& proxy);
  /// Nothing, with an error line, when no application has its document folder there.
  static std::optional<std::string> fromAppLibraryDataContainerURL(ApplicationRegistry& registry,
                                                                   const URL& url);
};

}  // namespace mirabel
