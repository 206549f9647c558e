#include "enumeration/OpenWalks.h"

#include <algorithm>
#include <utility>

namespace mirabel {

void OpenWalks::keep(const std::string& container, const Data& cursor,
                     std::unique_ptr<FSDirectoryWalk> walk) {
  const std::lock_guard lock(mutex_);
  directories_ += walk->openDirectories();
  kept_.push_back({container, cursor, std::move(walk)});
  while (kept_.size() > mostWalks || directories_ > mostDirectories)
    dropOldest();
}

std::unique_ptr<FSDirectoryWalk> OpenWalks::take(const std::string& container, const Data& cursor) {
  const std::lock_guard lock(mutex_);
  const auto found = std::ranges::find_if(kept_, [&](const Kept& kept) {
    return kept.container == container && kept.cursor == cursor;
  });
  if (found == kept_.end()) return nullptr;
  auto walk = std::move(found->walk);
  directories_ -= walk->openDirectories();
  kept_.erase(found);
  return walk;
}

void OpenWalks::dropOldest() {
  directories_ -= kept_.front().walk->openDirectories();
  kept_.pop_front();
}

}  // namespace mirabel
