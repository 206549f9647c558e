#include "fs/FSChangesEnumerations.h"

#include <utility>

namespace mirabel {

std::shared_ptr<ChangesEnumeration> FSChangesEnumerations::make(
    const FSChangeToken& token, const std::string& container, const std::vector<URL>& urls,
    std::shared_ptr<VesselChangeObserver> observer) {
  auto enumerator = std::make_shared<FSChangesEnumerator>(
      context_, events_, roots_, token, container, urls, std::move(observer), running_);
  const std::lock_guard lock(mutex_);
  std::erase_if(made_, [](const auto& earlier) { return earlier.expired(); });
  made_.push_back(enumerator);
  return enumerator;
}

FSChangesEnumerations::~FSChangesEnumerations() {
  for (const auto& made : made_) {
    const auto enumerator = made.lock();
    if (enumerator) enumerator->stop();
  }
  running_->stop();
}

}  // namespace mirabel
