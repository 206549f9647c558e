#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "fs/FSChangesEnumerator.h"
#include "fs/RunningReaders.h"

namespace mirabel {

/// Makes the enumerations of changes of one provider.
class FSChangesEnumerations final : public ChangesEnumerations {
 public:
  /// References outlive it and everything that it makes.
  FSChangesEnumerations(const ItemContext& context, EventStreams& events,
                        const AppLibraryRoots& roots)
      : context_(context), events_(events), roots_(roots) {}
  /// Stops what still runs, and waits for it: what it uses may go afterwards.
  ~FSChangesEnumerations() override;

  [[nodiscard]] std::shared_ptr<ChangesEnumeration> make(
      const FSChangeToken& token, const std::string& container, const std::vector<URL>& urls,
      std::shared_ptr<VesselChangeObserver> observer) override;

 private:
  ItemContext context_;
  EventStreams& events_;
  const AppLibraryRoots& roots_;
  std::shared_ptr<RunningReaders> running_ = std::make_shared<RunningReaders>();
  std::mutex mutex_;
  std::vector<std::weak_ptr<FSChangesEnumerator>> made_;  // with mutex_
};

}  // namespace mirabel
