#include "enumeration/OpenWalks.h"

#include <algorithm>
#include <utility>

namespace mirabel {

bool OpenWalks::keep(const std::string& container, const Data& cursor,
                     std::unique_ptr<FSDirectoryWalk> walk, const Data& position) {
  {
    const std::lock_guard lock(mutex_);
    Kept next{container, cursor, position, std::move(walk)};
    if (!isAmbiguous(next)) {
      directories_ += next.walk->openDirectories();
      kept_.push_back(std::move(next));
      while (kept_.size() > mostWalks || directories_ > mostDirectories)
        dropOldest();
      return true;
    }
  }
  spoil(container, cursor);
  return false;
}

void OpenWalks::spoil(const std::string& container, const Data& cursor) {
  const std::lock_guard lock(mutex_);
  for (Kept& kept : kept_)
    if (kept.container == container && kept.cursor == cursor) close(kept);
  kept_.push_back({container, cursor, {}, nullptr});
  if (kept_.size() > mostWalks) dropOldest();
}

std::unique_ptr<FSDirectoryWalk> OpenWalks::take(const std::string& container, const Data& cursor) {
  const std::lock_guard lock(mutex_);
  const auto found = std::ranges::find_if(kept_, [&](const Kept& kept) {
    return kept.walk && kept.container == container && kept.cursor == cursor;
  });
  if (found == kept_.end()) return nullptr;
  auto walk = std::move(found->walk);
  directories_ -= walk->openDirectories();
  kept_.erase(found);
  return walk;
}

bool OpenWalks::isAmbiguous(const Kept& next) const {
  return std::ranges::any_of(kept_, [&](const Kept& kept) {
    if (kept.container != next.container || kept.cursor != next.cursor) return false;
    return !kept.walk || next.position.empty() || kept.position != next.position;
  });
}

void OpenWalks::dropOldest() {
  close(kept_.front());
  kept_.pop_front();
}

void OpenWalks::close(Kept& kept) {
  if (kept.walk) directories_ -= kept.walk->openDirectories();
  kept.walk.reset();
}

}  // namespace mirabel
