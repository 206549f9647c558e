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
  const bool isHere = *row && (missing.isLink || (*row)->location == missing.location);
  // It may have come back since, or the folder that it lies in was closed for a moment.
  auto stands = isHere ? context_.paths.isAt(**row, missing.location) : false;
  if (!stands || *stands) return stands ? Result<void>() : fail(stands.error());
  if (missing.isLink) {
    auto removed = context_.store.removeLink(missing.location.folder, missing.location.name);
    if (!removed || !*row) return removed;
    context_.recorder.noteSurvivor((*row)->fileID);
    return context_.recorder.changed(**row, missing.location);
  }
  return !isHere ? Result<void>() : context_.learner.leave(std::move(**row));
}

}  // namespace mirabel
