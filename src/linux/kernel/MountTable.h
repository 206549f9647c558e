#pragma once

#include <functional>
#include <string_view>

#include "mirabel/UniqueFd.h"

namespace mirabel {

/// Tells when a file system was mounted, or unmounted, where it changes what is there: no record of
/// the kernel's watchers says so. Used by one thread at a time.
class MountTable {
 public:
  /// That of the calling thread's mount namespace. Where it can't be read, nothing is told.
  MountTable();

  using IsConcerned = std::function<bool(std::string_view path)>;
  /// Whether something may have been mounted or unmounted at a path of which `isConcerned` says yes
  /// since the last call, which is false for the first. Costs a system call where nothing was
  /// mounted anywhere.
  [[nodiscard]] bool hasChanged(const IsConcerned& isConcerned);

  /// Has the priority events of poll when something changes; -1 where there is none. Polling takes
  /// the event, so that whoever waits has a table of its own.
  [[nodiscard]] int descriptor() const { return file_.get(); }

 private:
  [[nodiscard]] bool holdsConcerned(const IsConcerned& isConcerned) const;

  UniqueFd file_;
  bool hasLooked_ = false;
  bool heldConcerned_ = false;
};

}  // namespace mirabel
