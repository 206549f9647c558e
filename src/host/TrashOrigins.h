#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "linux/volume/KeptAttributes.h"
#include "mirabel/Error.h"

namespace mirabel {

/// Where a trashed item came from: the parent's identifier, which lasts through whatever happens to
/// the parent, and the item's name there.
struct TrashOrigin {
  std::string parentItemIdentifier;
  std::string filename;

  friend bool operator==(const TrashOrigin&, const TrashOrigin&) = default;
};

/// What the host remembers of items that it trashed out of the document storage, by file ID: kept
/// in the volume's state under the name "mirabel.trash.origin", as an archive of the two texts. Any
/// thread may call it.
class TrashOrigins {
 public:
  /// `kept` outlives it.
  explicit TrashOrigins(KeptAttributes& kept) : kept_(kept) {}

  /// On disk when it returns. Errors of `ErrorDomain::store`.
  [[nodiscard]] Result<void> remember(std::uint64_t fileID, const TrashOrigin& origin);
  /// Nothing where nothing is remembered.
  [[nodiscard]] std::optional<TrashOrigin> find(std::uint64_t fileID) const;
  void forget(std::uint64_t fileID);

 private:
  KeptAttributes& kept_;
};

}  // namespace mirabel
