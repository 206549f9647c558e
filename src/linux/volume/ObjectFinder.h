#pragma once

#include <functional>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "linux/kernel/MonitoredRoots.h"
#include "linux/volume/IdentityStore.h"
#include "linux/volume/ObjectMatcher.h"
#include "linux/volume/RecentPlaces.h"
#include "linux/volume/TreeSearch.h"

namespace mirabel {

/// Finds out where objects are that left the place where they were last seen. One look through
/// the roots answers for many: what it learned is kept until `forget`.
class ObjectFinder {
 public:
  /// `roots` outlives it. `device` is the number of the volume's own file system.
  ObjectFinder(const MonitoredRoots& roots, std::uint64_t device)
      : roots_(roots), device_(device) {}

  struct Found {
    std::string folderPath;
    std::string name;
    ObjectStatus status;
  };
  /// Further objects that will be asked for soon; called before the roots are looked through.
  using Others = std::function<std::vector<ObjectRow>()>;

  /// Looks where names have changed of late, where that is known; else in the folder at
  /// `folderPath` first, then everywhere.
  /// Errors: `ErrorDomain::store`, and the passing ones of a look, see `LookFailure`: then nothing
  /// is known of where it is.
  [[nodiscard]] Result<std::optional<Found>> find(const ObjectRow& row,
                                                  const std::string& folderPath,
                                                  const Others& others);
  void forget() { answers_.clear(); }
  /// Whether it is known where names have changed of late.
  [[nodiscard]] bool isFollowing() const { return recent_ != nullptr && recent_->isInStep(); }
  /// `places` outlives it; null: nobody knows.
  void setRecentPlaces(RecentPlaces* places) { recent_ = places; }

 private:
  [[nodiscard]] Result<std::optional<Found>> lookAt(const ObjectRow& row,
                                                    const Candidate& candidate) const;
  [[nodiscard]] Result<bool> isObject(const ObjectRow& row, const Candidate& candidate,
                                      const PreciseLook& look) const;
  [[nodiscard]] Result<std::optional<Found>> findAmong(
      const ObjectRow& row, const std::vector<RecentPlace>& places) const;
  [[nodiscard]] Result<void> search(const ObjectRow& row, const std::string& folderPath,
                                    const Others& others);

  const MonitoredRoots& roots_;
  std::uint64_t device_;
  RecentPlaces* recent_ = nullptr;
  std::map<std::uint64_t, std::optional<Found>> answers_;  // by slot
};

}  // namespace mirabel
