#pragma once

#include <optional>
#include <string_view>

#include "mirabel/Error.h"
#include "mirabel/Values.h"

namespace mirabel {

/// Where listings stand whose next page has not been asked for yet, kept with the volume's state,
/// so that another process can go on with them. A bounded number: an old one is forgotten for a
/// new one, and so may be any that is too large. Any thread may call it.
class ListingPositions {
 public:
  virtual ~ListingPositions() = default;

  /// Keeps `position` for the listing of the container that goes on at `cursor`, instead of what
  /// was kept there. It is on disk when this returns. POSIX errors: it is not kept then; EMSGSIZE
  /// for one that is too large.
  [[nodiscard]] virtual Result<void> keep(std::string_view container, const Data& cursor,
                                          const Data& position) = 0;
  /// What was kept there, byte for byte; nothing when it was forgotten or got damaged.
  [[nodiscard]] virtual std::optional<Data> find(std::string_view container,
                                                 const Data& cursor) = 0;
};

}  // namespace mirabel
