#pragma once

#include <string>
#include <utility>

#include "mirabel/Documents.h"

namespace mirabel {

/// How a person names what can be listed and followed: like an item, or by one of the words
/// "workingset", everything that is shown, and "alldirs", every folder of that. A path of such a
/// name is "./workingset".
class ContainerArgument {
 public:
  explicit ContainerArgument(std::string text) : text_(std::move(text)) {}

  /// Errors: those of `ItemArgument`.
  [[nodiscard]] Result<std::string> identifier(Documents& documents) const;

 private:
  std::string text_;
};

}  // namespace mirabel
