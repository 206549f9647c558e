#pragma once

#include <string>

#include "cli/Program.h"

namespace mirabel {

/// Anchors as they are printed, and what has changed since one.
class ChangeBatch {
 public:
  /// Errors: see `DocumentContainer::currentSyncAnchor`.
  [[nodiscard]] static Result<std::string> currentAnchor(DocumentContainer& container);
  /// Errors: those of `DocumentContainer::changes`; `syncAnchorExpired` for a text that is no
  /// anchor.
  [[nodiscard]] static Result<ChangeBatch> ask(DocumentContainer& container,
                                               const std::string& anchor);

  /// A line for each change, or one JSON object for all.
  void print(const Program& program) const;
  [[nodiscard]] bool isEmpty() const {
    return changes_.updated.empty() && changes_.deleted.empty();
  }
  /// Where to ask on from, as it is printed.
  [[nodiscard]] std::string anchor() const;
  [[nodiscard]] bool moreComing() const { return changes_.moreComing; }

 private:
  explicit ChangeBatch(ItemChanges changes) : changes_(std::move(changes)) {}
  ItemChanges changes_;
};

}  // namespace mirabel
