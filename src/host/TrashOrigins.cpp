#include "host/TrashOrigins.h"

#include "foundation/KeyedArchive.h"
#include "foundation/Log.h"

namespace mirabel {
namespace {

constexpr std::string_view name = "mirabel.trash.origin";

}  // namespace

Result<void> TrashOrigins::remember(std::uint64_t fileID, const TrashOrigin& origin) {
  auto bytes = keyedarchive::archiveStrings({origin.parentItemIdentifier, origin.filename});
  if (!bytes) return fail(bytes.error());
  return kept_.set(fileID, name, *std::move(bytes));
}

std::optional<TrashOrigin> TrashOrigins::find(std::uint64_t fileID) const {
  const auto kept = kept_.of(fileID);
  const auto found = kept.find(name);
  if (found == kept.end() || !found->second) return {};
  auto texts = keyedarchive::unarchiveStrings(*found->second);
  if (!texts || texts->size() != 2) return {};
  return TrashOrigin{std::move((*texts)[0]), std::move((*texts)[1])};
}

void TrashOrigins::forget(std::uint64_t fileID) {
  if (auto forgotten = kept_.forget(fileID, name); !forgotten) {
    logError("can't forget where an item came from; " + forgotten.error().description());
  }
}

}  // namespace mirabel
