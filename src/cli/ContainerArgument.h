#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "cli/Session.h"
#include "foundation/URL.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// A container as it was found.
struct Container {
  std::string identifier;
  std::optional<URL> folder;  ///< absent for those that stand for many folders
};

/// How a person names what can be listed and followed: like an item, or by one of the words
/// "workingset", everything that is shown, and "alldirs", every folder of that. A path of such a
/// name is "./workingset".
class ContainerArgument {
 public:
  explicit ContainerArgument(std::string text) : text_(std::move(text)) {}

  /// Errors: those of `ItemArgument`.
  [[nodiscard]] Result<Container> container(const Session& session) const;
  /// The same, and POSIX ENOTDIR for what is no folder: of a file no changes would ever be told.
  [[nodiscard]] Result<Container> followed(const Session& session) const;
  /// The enumerator of what can be followed. Errors: the same, and those of `Session::enumerator`.
  [[nodiscard]] Result<std::shared_ptr<VesselEnumerator>> enumerator(Session& session) const;

 private:
  std::string text_;
};

}  // namespace mirabel
