#pragma once

#include <memory>
#include <optional>
#include <string>

#include "foundation/URL.h"
#include "host/HostedProvider.h"
#include "mirabel/Documents.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// Collects one batch of changes; made by whoever asks an enumerator for them.
[[nodiscard]] Result<ItemChanges> changesSince(VesselEnumerator& enumerator, const Data& anchor);
/// Error: `LocalVesselError::unableToGetDeviceUUID`.
[[nodiscard]] Result<Data> currentAnchorOf(VesselEnumerator& enumerator);
/// Why there was no anchor, where the provider can tell: an enumerator says no more than that there
/// is none. Any other error is answered as it is.
[[nodiscard]] Error reasonFor(Error noAnchor, const HostedProvider& provider);

/// A container of the provider in this process. What was found by its identifier is followed by
/// it, wherever it is moved.
class LocalContainer final : public DocumentContainer {
 public:
  /// The provider outlives the container. Errors: see `Documents::container`.
  [[nodiscard]] static Result<std::unique_ptr<LocalContainer>> open(HostedProvider& provider,
                                                                    std::string identifier);
  ~LocalContainer() override;
  LocalContainer(const LocalContainer&) = delete;
  LocalContainer& operator=(const LocalContainer&) = delete;

  [[nodiscard]] Result<ItemPage> items(const Data& cursor) override;
  [[nodiscard]] Result<ItemChanges> changes(const Data& anchor) override;
  [[nodiscard]] Result<Data> currentSyncAnchor() override;

  /// Where it lies; nothing for a container that stands for many folders. Errors: those of `open`.
  [[nodiscard]] static Result<std::optional<URL>> placeOf(const HostedProvider& provider,
                                                          const std::string& identifier);

 private:
  LocalContainer(HostedProvider& provider, std::string identifier)
      : provider_(provider), identifier_(std::move(identifier)) {}
  /// The enumerator of where the container lies now.
  [[nodiscard]] Result<VesselEnumerator*> enumerator();
  void invalidate();

  HostedProvider& provider_;
  std::string identifier_;
  std::optional<URL> place_;
  std::shared_ptr<VesselEnumerator> enumerator_;
};

}  // namespace mirabel
