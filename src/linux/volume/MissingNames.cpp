#include "linux/volume/MissingNames.h"

#include <utility>

namespace mirabel {

Result<void> MissingNames::add(std::uint64_t folder, const std::string& name) {
  auto link = context_.store.linkAt(folder, name);
  if (!link) return fail(link.error());
  if (*link) addLink(**link, {folder, name});
  auto object = context_.store.objectAt(folder, name);
  if (!object) return fail(object.error());
  if (*object) addObject((*object)->slot, {folder, name});
  return {};
}

Result<void> MissingNames::settle() {
  auto names = std::exchange(missing_, {});
  // Further names first: an object must not go on under one that is not shown any more.
  for (const bool isLink : {true, false}) {
    for (const Missing& missing : names) {
      if (missing.isLink != isLink) continue;
      if (auto settled = settle(missing); !settled) return settled;
    }
  }
  return {};
}

Result<void> MissingNames::settle(const Missing& missing) {
  auto row = context_.store.objectInSlot(missing.slot);
  if (!row) return fail(row.error());
  if (missing.isLink) {
    auto removed = context_.store.removeLink(missing.location.folder, missing.location.name);
    if (!removed || !*row) return removed;
    context_.recorder.noteSurvivor((*row)->fileID);
    return context_.recorder.changed(**row, missing.location);
  }
  if (!*row || (*row)->location != missing.location) return {};
  return context_.learner.leave(std::move(**row));
}

}  // namespace mirabel
