#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "host/HostedProvider.h"
#include "items/LocalItem.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Finds items the way programs ask for them, and says why one is not found. Any thread may call
/// it.
class ItemLookup {
 public:
  /// It outlives the lookup.
  explicit ItemLookup(const HostedProvider& provider) : provider_(provider) {}

  /// Errors: the host's no-such-item error; `LocalVesselError::itemNotFound`, with the reason, for
  /// an application whose documents are not shown; POSIX ENOENT for a root that is not there. POSIX
  /// and store errors where it is not known whether there is such an item.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> byIdentifier(std::string_view identifier) const;
  /// What lies at an absolute path whose links are resolved but for the last component; that may
  /// be a link to the document storage or to an app library. Errors: POSIX and file errors for a
  /// path that leads nowhere, `LocalVesselError::itemNotFound`, with the reason, for one that leads
  /// to no item.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> atPath(const std::string& path) const;
  /// Why the documents of the application are left out of what is shown, in words, if they are for
  /// another reason than that it shows none.
  [[nodiscard]] std::optional<std::string> reasonLeftOut(std::string_view bundle) const;
  /// Whether it is the document folder of an application that is listed.
  [[nodiscard]] bool isLibrary(const URL& url) const;

 private:
  /// Looks again for what was not found: the first look does not say why.
  [[nodiscard]] Result<std::shared_ptr<LocalItem>> byIdentifierAgain(
      std::string_view identifier) const;
  [[nodiscard]] bool isWithinLibrary(const URL& url) const;
  [[nodiscard]] bool isShown(const LocalItem& item) const;
  [[nodiscard]] std::string withoutLinkToRoot(const std::string& path) const;
  [[nodiscard]] const std::string& storage() const;

  const HostedProvider& provider_;
};

}  // namespace mirabel
