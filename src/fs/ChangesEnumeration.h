#pragma once

#include <memory>
#include <string>
#include <vector>

#include "foundation/URL.h"
#include "fs/FSChangeToken.h"
#include "platform/EnumerationObservers.h"

namespace mirabel {

/// One enumeration of the changes of a container. Its enumerator keeps it until it has finished:
/// the finishing call lets go of it, so that whoever makes that call has to hold it.
class ChangesEnumeration {
 public:
  virtual ~ChangesEnumeration() = default;
  /// Makes it the delegate of its event reader and starts that; called once. Everything that is
  /// reported comes later, on the reader's queue.
  virtual void start() = 0;
  /// Ends it without a finish: nothing is reported that is not under way. Any thread.
  virtual void stop() = 0;
};

/// Makes the enumerations of a provider. Any thread may call it.
class ChangesEnumerations {
 public:
  virtual ~ChangesEnumerations() = default;
  /// `urls` is not empty, the document storage the first where it is among several. `observer`
  /// gets batches and one finish.
  [[nodiscard]] virtual std::shared_ptr<ChangesEnumeration> make(
      const FSChangeToken& token, const std::string& container, const std::vector<URL>& urls,
      std::shared_ptr<VesselChangeObserver> observer) = 0;
};

}  // namespace mirabel
