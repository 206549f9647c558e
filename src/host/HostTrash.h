#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "host/TrashOrigins.h"
#include "provider/LocalVessel.h"

namespace mirabel {

/// The trash as a host uses it: the provider's, and where things came from. The provider notes that
/// on an application's documents once they are moved, and the note stays when they are put back;
/// what is remembered is that of the last time, and before the move. Any thread may call it; it
/// outlives the completion handlers that it was given.
class HostTrash {
 public:
  /// Both outlive it.
  HostTrash(LocalVessel& provider, KeptAttributes& kept) : provider_(provider), origins_(kept) {}

  /// See `LocalVessel::trashItemWithIdentifier`. Where the item came from is on disk before it is
  /// moved; where that can't be, it is not moved. Errors of `ErrorDomain::store` too.
  void trash(std::string_view identifier, const std::optional<URL>& place,
             LocalVessel::ItemHandler completionHandler);
  /// See `LocalVessel::untrashItemWithIdentifier`; without a parent, or with one that is
  /// unknown or in the trash, an item goes back to the one that it had, under its own name.
  void restore(std::string_view identifier, const std::optional<URL>& place,
               std::optional<std::string> toParentItemIdentifier,
               LocalVessel::ItemHandler completionHandler);

 private:
  LocalVessel& provider_;
  TrashOrigins origins_;
};

}  // namespace mirabel
