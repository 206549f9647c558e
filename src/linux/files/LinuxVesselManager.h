#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "foundation/URL.h"
#include "platform/VesselManager.h"

namespace mirabel {

/// Knows the document storage, which was resolved when the platform was opened, and passes signals
/// on to whoever plays the host in this process. Where nobody does, nobody keeps an older state
/// that a signal could refresh, so that it is taken notice of as soon as it is given.
class LinuxVesselManager final : public VesselManager {
 public:
  using SignalListener =
      std::function<void(std::string_view container, const SignalHandler& completionHandler)>;

  explicit LinuxVesselManager(URL documentStorage) : documentStorage_(std::move(documentStorage)) {}

  const URL& documentStorageURL() const override { return documentStorage_; }

  /// From now on `listener` gets the signals, on the threads that give them, and has to call the
  /// handler of each; an empty one ends that. One that is being called is kept until it returns.
  void setSignalListener(SignalListener listener) {
    const std::lock_guard lock(mutex_);
    listener_ = listener ? std::make_shared<SignalListener>(std::move(listener)) : nullptr;
  }

  void signalEnumeratorForContainerItemIdentifier(std::string_view container,
                                                  SignalHandler completionHandler) override {
    if (const auto listener = currentListener()) return (*listener)(container, completionHandler);
    completionHandler(std::nullopt);
  }

  using DomainDeleter = std::function<std::optional<Error>(const std::vector<std::string>&)>;
  /// Has `deleter` take domains out of the search index from now on; without one there is none that
  /// anything could be left in. Not while the manager is in use.
  void setDomainDeleter(DomainDeleter deleter) { domainDeleter_ = std::move(deleter); }

  void deleteSearchableItemsWithDomainIdentifiers(const std::vector<std::string>& domainIdentifiers,
                                                  DeletionHandler completionHandler) override {
    completionHandler(domainDeleter_ ? domainDeleter_(domainIdentifiers) : std::nullopt);
  }

 private:
  std::shared_ptr<SignalListener> currentListener() {
    const std::lock_guard lock(mutex_);
    return listener_;
  }

  URL documentStorage_;
  std::mutex mutex_;
  std::shared_ptr<SignalListener> listener_;
  DomainDeleter domainDeleter_;
};

}  // namespace mirabel
