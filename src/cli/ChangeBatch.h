#pragma once

#include <future>
#include <memory>
#include <string>
#include <vector>

#include "cli/Program.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// The anchor of now, as it is printed. Error: `LocalVesselError::unableToGetDeviceUUID`.
[[nodiscard]] Result<std::string> currentAnchor(VesselEnumerator& enumerator);

/// One batch of changes, as an enumerator tells it and as it is printed.
class ChangeBatch final : public VesselChangeObserver {
 public:
  /// Asks what has changed since `anchor` and waits for the answer. Errors: `syncAnchorExpired`,
  /// also for a text that is no anchor; others of the enumerator.
  [[nodiscard]] static Result<std::shared_ptr<const ChangeBatch>> ask(VesselEnumerator& enumerator,
                                                                      const std::string& anchor);

  /// A line for each change, or one JSON object for all.
  void print(const Program& program) const;
  [[nodiscard]] bool isEmpty() const { return updated_.empty() && deleted_.empty(); }
  /// Where to ask on from, as it is printed.
  [[nodiscard]] const std::string& anchor() const { return anchor_; }
  [[nodiscard]] bool moreComing() const { return moreComing_; }

  void didUpdateItems(const VesselItems& items) override;
  void didDeleteItemsWithIdentifiers(const std::vector<std::string>& identifiers) override;
  void finishEnumeratingChangesUpToSyncAnchor(const Data& anchor, bool moreComing) override;
  void finishEnumeratingWithError(const Error& error) override;

 private:
  VesselItems updated_;
  std::vector<std::string> deleted_;
  std::string anchor_;
  bool moreComing_ = false;
  std::promise<Result<void>> finished_;
};

}  // namespace mirabel
